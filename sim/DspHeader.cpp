// SPDX-License-Identifier: Apache-2.0

#include "sim/DspHeader.h"

#include <string.h>

namespace {

uint32_t little(const uint8_t* bytes, size_t size) {
    uint32_t value = 0;
    for (size_t i = size; i > 0; --i) {
        value = value << 8 | bytes[i - 1];
    }
    return value;
}

// The ones' complement sum of the words at 4, 6 and 8, and the checksum itself, has all
// bits set.
bool sum_fits(const uint8_t* header) {
    uint32_t sum = 0;
    for (size_t at = 4; at <= 10; at += 2) {
        sum += little(header + at, 2);
    }
    sum = (sum & 0xFFFF) + (sum >> 16);
    return ((sum & 0xFFFF) + (sum >> 16)) == 0xFFFF;
}

}  // namespace

bool DspHeader::read(const uint8_t* bytes) {
    const uint32_t inner_size = little(bytes + 16, 2);
    if (memcmp(bytes, "\x7E\x7E\x7E\x7E", 4) != 0 || inner_size < 8 || inner_size - 8 > MAX_DATA) {
        return false;
    }
    data_size = inner_size - 8;
    number = little(bytes + 12, 4);
    source = bytes[19] == 0x40   ? DspSource::LOG
             : bytes[19] == 0x42 ? DspSource::DUMP
             : bytes[19] == 0x43 ? DspSource::PCM
                                 : DspSource::UNKNOWN;
    right_form = little(bytes + 4, 2) == data_size + 16 && little(bytes + 6, 2) == 0 &&
                 little(bytes + 8, 2) == 0x5A5A && bytes[18] == 0x9D;
    right_sum = sum_fits(bytes);
    return true;
}
