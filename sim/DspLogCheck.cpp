// SPDX-License-Identifier: Apache-2.0

#include "sim/DspLogCheck.h"

#include <fstream>
#include <iterator>

#include "sim/DspHeader.h"

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
    DspHeader header;
    if (len < DspHeader::SIZE || !header.read(bytes) || header.data_size > len - DspHeader::SIZE) {
        return 0;
    }
    const std::string name = "chunk " + std::to_string(header.number);
    if (!header.right_form) {
        damage(name + " has a wrong header");
    }
    if (!header.right_sum) {
        damage(name + " has a wrong checksum");
    }
    if (header.number != m_next_number) {
        damage(name + " in place of " + std::to_string(m_next_number));
    }
    m_next_number = header.number + 1;
    ++m_chunks;
    const uint8_t* data = bytes + DspHeader::SIZE;
    if (header.source == DspSource::UNKNOWN) {
        damage(name + " is of an unknown kind");
    } else {
        std::vector<uint8_t>& all = m_data[static_cast<size_t>(header.source)];
        all.insert(all.end(), data, data + header.data_size);
    }
    return DspHeader::SIZE + header.data_size;
}
