// SPDX-License-Identifier: Apache-2.0

#include "sim/sha1.h"

#include <stdio.h>

namespace {

uint32_t rotate_left(uint32_t value, unsigned bits) {
    return value << bits | value >> (32 - bits);
}

void add_block(uint32_t (&state)[5], const uint8_t* block) {
    uint32_t w[80];
    for (size_t i = 0; i < 16; ++i) {
        w[i] = static_cast<uint32_t>(block[4 * i]) << 24 |
               static_cast<uint32_t>(block[4 * i + 1]) << 16 |
               static_cast<uint32_t>(block[4 * i + 2]) << 8 | block[4 * i + 3];
    }
    for (size_t i = 16; i < 80; ++i) {
        w[i] = rotate_left(w[i - 3] ^ w[i - 8] ^ w[i - 14] ^ w[i - 16], 1);
    }
    uint32_t a = state[0], b = state[1], c = state[2], d = state[3], e = state[4];
    for (size_t i = 0; i < 80; ++i) {
        const uint32_t f = i < 20   ? ((b & c) | (~b & d)) + 0x5A827999
                           : i < 40 ? (b ^ c ^ d) + 0x6ED9EBA1
                           : i < 60 ? ((b & c) | (b & d) | (c & d)) + 0x8F1BBCDC
                                    : (b ^ c ^ d) + 0xCA62C1D6;
        const uint32_t next = rotate_left(a, 5) + f + e + w[i];
        e = d;
        d = c;
        c = rotate_left(b, 30);
        b = a;
        a = next;
    }
    state[0] += a;
    state[1] += b;
    state[2] += c;
    state[3] += d;
    state[4] += e;
}

}  // namespace

std::vector<uint8_t> sha1(const uint8_t* data, size_t len) {
    uint32_t state[5] = {0x67452301, 0xEFCDAB89, 0x98BADCFE, 0x10325476, 0xC3D2E1F0};
    const size_t whole = len / 64 * 64;
    for (size_t at = 0; at < whole; at += 64) {
        add_block(state, data + at);
    }
    // The rest, a bit 1, zeros, and the length in bits.
    std::vector<uint8_t> tail(data + whole, data + len);
    tail.push_back(0x80);
    while (tail.size() % 64 != 56) {
        tail.push_back(0);
    }
    for (int shift = 56; shift >= 0; shift -= 8) {
        tail.push_back(static_cast<uint8_t>(static_cast<uint64_t>(len) * 8 >> shift));
    }
    for (size_t at = 0; at < tail.size(); at += 64) {
        add_block(state, tail.data() + at);
    }
    std::vector<uint8_t> digest;
    for (uint32_t word : state) {
        for (int shift = 24; shift >= 0; shift -= 8) {
            digest.push_back(static_cast<uint8_t>(word >> shift));
        }
    }
    return digest;
}

std::string digest_text(const std::vector<uint8_t>& digest) {
    std::string text;
    for (uint8_t byte : digest) {
        char digits[3];
        snprintf(digits, sizeof digits, "%02X", byte);
        text += digits;
    }
    return text;
}
