// SPDX-License-Identifier: Apache-2.0
// How long a frame is, for whoever goes through a log and only counts: what
// DiagFrameParser::measure() tells, sooner. The length in the frame's header says where it should
// end, so that its bytes are looked at 32 at a time, and each of them once.
#ifndef KESTLOG_MEASURE_FRAME_H_
#define KESTLOG_MEASURE_FRAME_H_

#include <stddef.h>
#include <stdint.h>

#include "channels/DiagFrameParser.h"

// As DiagFrameParser::measure().
size_t measure_frame(const uint8_t* data, size_t len, DiagHeader& header, size_t& body_len);

#endif  // KESTLOG_MEASURE_FRAME_H_
