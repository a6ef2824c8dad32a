// SPDX-License-Identifier: Apache-2.0
// How samples lie in an I/Q capture or in PCM data. Nothing in the files says so: it is asked for.
#ifndef KESTLOG_SAMPLEFORMAT_H_
#define KESTLOG_SAMPLEFORMAT_H_

#include <stddef.h>
#include <stdint.h>

#include <string>
#include <vector>

struct SampleFormat {
    const char* iq;                    // the name of the complex format, as SigMF has it, or null
    const char* pcm;                   // the name of the real format or null
    size_t bytes;                      // of one number
    float (*read)(const uint8_t* at);  // full scale is 1
};

// Null when there is no such format.
const SampleFormat* iq_format(const std::string& name);
const SampleFormat* pcm_format(const std::string& name);

std::vector<std::string> iq_format_names();
std::vector<std::string> pcm_format_names();

#endif  // KESTLOG_SAMPLEFORMAT_H_
