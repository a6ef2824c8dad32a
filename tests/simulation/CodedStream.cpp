// SPDX-License-Identifier: Apache-2.0

#include "simulation/CodedStream.h"

#include <string.h>

#include <algorithm>

namespace {

// A bijection of 64-bit words and its inverse: multiplications by odd numbers and shifts.
constexpr uint64_t FACTOR = 0xff51afd7ed558ccdu;
constexpr uint64_t INVERSE = 0x4f74430c22a54005u;
static_assert(FACTOR * INVERSE == 1, "not inverse to each other");

uint64_t scramble(uint64_t x) {
    x ^= x >> 33;
    x *= FACTOR;
    return x ^ (x >> 33);
}

uint64_t unscramble(uint64_t x) {
    x ^= x >> 33;
    x *= INVERSE;
    return x ^ (x >> 33);
}

uint64_t key(unsigned stream) {
    return uint64_t{stream + 1} << 56;
}

}  // namespace

namespace coded_stream {

void fill(unsigned stream, uint64_t position, uint8_t* data, size_t len) {
    while (len > 0) {
        const uint64_t word = scramble(position / 8 + key(stream));
        const size_t from = position % 8;
        const size_t n = std::min(len, 8 - from);
        memcpy(data, reinterpret_cast<const uint8_t*>(&word) + from, n);
        data += n;
        position += n;
        len -= n;
    }
}

size_t match(unsigned stream, uint64_t position, const uint8_t* data, size_t len) {
    uint8_t expected[512];
    size_t same = 0;
    while (same < len) {
        const size_t n = std::min(len - same, sizeof(expected));
        fill(stream, position + same, expected, n);
        if (memcmp(data + same, expected, n) != 0) {
            while (data[same] == expected[0]) {
                fill(stream, position + ++same, expected, 1);
            }
            return same;
        }
        same += n;
    }
    return same;
}

bool locate(unsigned stream, const uint8_t* data, size_t len, uint64_t* position) {
    for (size_t offset = 0; offset < 8 && offset + 8 <= len; ++offset) {
        uint64_t word;
        memcpy(&word, data + offset, sizeof(word));
        const uint64_t at = (unscramble(word) - key(stream)) * 8;
        if (unscramble(word) - key(stream) < LIMIT / 8 && at >= offset &&
            match(stream, at - offset, data, offset + 8) == offset + 8) {
            *position = at - offset;
            return true;
        }
    }
    return false;
}

}  // namespace coded_stream
