// SPDX-License-Identifier: Apache-2.0
// The endless stream of one log device. Each of its 8-byte words encodes its own position, so
// that any slice of 15 bytes or more tells where in which stream it belongs.
#ifndef SIMULATION_CODEDSTREAM_H_
#define SIMULATION_CODEDSTREAM_H_

#include <stddef.h>
#include <stdint.h>

namespace coded_stream {

// Positions are below this; a word that decodes to a larger one is no word of a stream.
constexpr uint64_t LIMIT = uint64_t{1} << 40;

void fill(unsigned stream, uint64_t position, uint8_t* data, size_t len);
// How many bytes are the stream's from that position on.
size_t match(unsigned stream, uint64_t position, const uint8_t* data, size_t len);
// Finds the position of the first byte. False when the slice holds no whole word.
bool locate(unsigned stream, const uint8_t* data, size_t len, uint64_t* position);

}  // namespace coded_stream

#endif  // SIMULATION_CODEDSTREAM_H_
