// SPDX-License-Identifier: Apache-2.0

#include "sim/DspLogCheck.h"

#include <string.h>

#include <algorithm>
#include <fstream>
#include <iterator>

namespace {

const size_t HEADER_SIZE = 20;

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

void DspLogCheck::damage(const std::string& text) {
    if (m_damages++ == 0) {
        m_first_damage = text;
    }
}

bool DspLogCheck::add_file(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    if (!in) {
        return false;
    }
    const std::vector<char> bytes((std::istreambuf_iterator<char>(in)),
                                  std::istreambuf_iterator<char>());
    const uint8_t* at = reinterpret_cast<const uint8_t*>(bytes.data());
    size_t left = bytes.size();
    while (left > 0) {
        const size_t n = take_chunk(at, left);
        if (n == 0) {
            damage(std::to_string(left) + " bytes at the end of " + path + " are no chunk");
            break;
        }
        at += n;
        left -= n;
    }
    return true;
}

// The bytes of the chunk, 0 if there is none.
size_t DspLogCheck::take_chunk(const uint8_t* bytes, size_t len) {
    if (len < HEADER_SIZE || memcmp(bytes, "\x7E\x7E\x7E\x7E", 4) != 0) {
        return 0;
    }
    const size_t n = little(bytes + 16, 2) - 8;
    if (n > len - HEADER_SIZE) {
        return 0;
    }
    const uint32_t number = little(bytes + 12, 4);
    const std::string name = "chunk " + std::to_string(number);
    if (little(bytes + 4, 2) != n + 16 || little(bytes + 6, 2) != 0 ||
        little(bytes + 8, 2) != 0x5A5A || bytes[18] != 0x9D) {
        damage(name + " has a wrong header");
    }
    if (!sum_fits(bytes)) {
        damage(name + " has a wrong checksum");
    }
    if (number != m_next_number) {
        damage(name + " in place of " + std::to_string(m_next_number));
    }
    m_next_number = number + 1;
    ++m_chunks;
    const Source source = bytes[19] == 0x40   ? LOG
                          : bytes[19] == 0x42 ? DUMP
                          : bytes[19] == 0x43 ? PCM
                                              : SOURCE_COUNT;
    if (source == SOURCE_COUNT) {
        damage(name + " is of an unknown kind");
    } else {
        m_data[source].insert(m_data[source].end(), bytes + HEADER_SIZE, bytes + HEADER_SIZE + n);
    }
    return HEADER_SIZE + n;
}
