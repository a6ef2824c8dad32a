// SPDX-License-Identifier: Apache-2.0

#include "sim/SimStream.h"

#include <string.h>

#include <algorithm>

#include "sim/DiagFrame.h"
#include "sim/noise.h"

namespace {

const uint64_t TYPES = 5;
const uint8_t FIRST_TYPE = 0x10;     // of no exchange
const uint8_t NEVER_ESCAPED = 0xdf;  // a mask: what remains is neither flag nor escape

}  // namespace

void SimStream::make_block(uint32_t number, uint8_t* block) const {
    uint64_t noise = noise_of(number ^ (static_cast<uint64_t>(m_seed) << 32) ^ m_cp);
    // Some types are more frequent than others.
    const uint64_t type = std::min(noise % TYPES, noise / TYPES % TYPES);
    uint8_t header[DiagFrame::HEADER_SIZE] = {};
    for (size_t i = 0; i < 4; ++i) {
        header[i] = static_cast<uint8_t>(number >> (8 * i));
    }
    header[6] = static_cast<uint8_t>(FIRST_TYPE + type);
    header[7] = static_cast<uint8_t>(noise >> 32) & 1;
    const auto escapes = std::count_if(header, header + 4, DiagFrame::must_escape);
    // The payload has the room that the escaped header leaves.
    header[4] = static_cast<uint8_t>(BLOCK_SIZE - 2 - static_cast<size_t>(escapes));
    size_t at = 0;
    block[at++] = DiagFrame::FLAG;
    for (const uint8_t byte : header) {
        if (DiagFrame::must_escape(byte)) {
            block[at++] = DiagFrame::ESCAPE;
            block[at++] = byte ^ DiagFrame::ESCAPE_XOR;
        } else {
            block[at++] = byte;
        }
    }
    while (at < BLOCK_SIZE - 1) {
        noise = noise_of(noise);
        for (int i = 0; i < 8 && at < BLOCK_SIZE - 1; ++i) {
            block[at++] = static_cast<uint8_t>(noise >> (8 * i)) & NEVER_ESCAPED;
        }
    }
    block[at] = DiagFrame::FLAG;
}

void SimStream::fill(uint64_t pos, uint8_t* dst, size_t len) const {
    uint8_t block[BLOCK_SIZE];
    while (len > 0) {
        const size_t from = pos % BLOCK_SIZE;
        const size_t n = std::min(len, BLOCK_SIZE - from);
        make_block(static_cast<uint32_t>(pos / BLOCK_SIZE), block);
        memcpy(dst, block + from, n);
        dst += n;
        pos += n;
        len -= n;
    }
}

bool SimStream::locate(const uint8_t* data, size_t len, size_t* offset, uint64_t* pos) const {
    uint8_t block[BLOCK_SIZE];
    for (size_t at = 0; at + BLOCK_SIZE <= len; ++at) {
        if (data[at] != DiagFrame::FLAG) {
            continue;
        }
        uint32_t number = 0;
        const uint8_t* from = data + at + 1;
        for (int i = 0; i < 4; ++i) {
            const bool escaped = *from == DiagFrame::ESCAPE;
            from += escaped ? 1 : 0;
            const int byte = *from++ ^ (escaped ? DiagFrame::ESCAPE_XOR : 0);
            number |= static_cast<uint32_t>(byte) << (8 * i);
        }
        make_block(number, block);
        if (memcmp(data + at, block, BLOCK_SIZE) == 0) {
            *offset = at;
            *pos = uint64_t{number} * BLOCK_SIZE;
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
        make_block(static_cast<uint32_t>((pos + done) / BLOCK_SIZE), block);
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
