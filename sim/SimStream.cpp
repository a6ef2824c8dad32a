// SPDX-License-Identifier: Apache-2.0

#include "sim/SimStream.h"

#include <string.h>

#include <algorithm>

namespace {

// Each block: magic (3 bytes), CP, block number (8 bytes, little-endian), noise.
const uint8_t MAGIC[3] = {0xa5, 'C', 'P'};
const size_t NUMBER_AT = 4;
const size_t NOISE_AT = 12;

uint64_t mix(uint64_t x) {
    x += 0x9e3779b97f4a7c15u;
    x = (x ^ (x >> 30)) * 0xbf58476d1ce4e5b9u;
    x = (x ^ (x >> 27)) * 0x94d049bb133111ebu;
    return x ^ (x >> 31);
}

}  // namespace

void SimStream::make_block(uint64_t number, uint8_t* block) const {
    memcpy(block, MAGIC, sizeof MAGIC);
    block[3] = m_cp;
    for (size_t i = 0; i < 8; ++i) {
        block[NUMBER_AT + i] = static_cast<uint8_t>(number >> (8 * i));
    }
    uint64_t noise = mix(number ^ (static_cast<uint64_t>(m_seed) << 32) ^ m_cp);
    for (size_t i = NOISE_AT; i < BLOCK_SIZE; i += 4) {
        block[i] = static_cast<uint8_t>(noise);
        block[i + 1] = static_cast<uint8_t>(noise >> 8);
        block[i + 2] = static_cast<uint8_t>(noise >> 16);
        block[i + 3] = static_cast<uint8_t>(noise >> 24);
        noise = mix(noise);
    }
}

void SimStream::fill(uint64_t pos, uint8_t* dst, size_t len) const {
    uint8_t block[BLOCK_SIZE];
    while (len > 0) {
        const size_t from = pos % BLOCK_SIZE;
        const size_t n = std::min(len, BLOCK_SIZE - from);
        make_block(pos / BLOCK_SIZE, block);
        memcpy(dst, block + from, n);
        dst += n;
        pos += n;
        len -= n;
    }
}

bool SimStream::locate(const uint8_t* data, size_t len, size_t* offset, uint64_t* pos) const {
    uint8_t block[BLOCK_SIZE];
    for (size_t at = 0; at + BLOCK_SIZE <= len; ++at) {
        if (memcmp(data + at, MAGIC, sizeof MAGIC) != 0) {
            continue;
        }
        uint64_t number = 0;
        for (size_t i = 8; i > 0; --i) {
            number = (number << 8) | data[at + NUMBER_AT + i - 1];
        }
        make_block(number, block);
        if (memcmp(data + at, block, BLOCK_SIZE) == 0) {
            *offset = at;
            *pos = number * BLOCK_SIZE;
            return true;
        }
    }
    return false;
}

size_t SimStream::match(uint64_t pos, const uint8_t* data, size_t len) const {
    uint8_t block[BLOCK_SIZE];
    size_t done = 0;
    while (done < len) {
        const size_t from = (pos + done) % BLOCK_SIZE;
        const size_t n = std::min(len - done, BLOCK_SIZE - from);
        make_block((pos + done) / BLOCK_SIZE, block);
        for (size_t i = 0; i < n; ++i) {
            if (data[done + i] != block[from + i]) {
                return done + i;
            }
        }
        done += n;
    }
    return done;
}

size_t SimStream::match_back(uint64_t pos, const uint8_t* data_end, size_t len) const {
    uint8_t byte;
    size_t done = 0;
    while (done < len && done < pos) {
        fill(pos - done - 1, &byte, 1);
        if (*(data_end - done - 1) != byte) {
            break;
        }
        ++done;
    }
    return done;
}
