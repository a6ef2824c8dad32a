// SPDX-License-Identifier: Apache-2.0

#include "kestlog/LineBuffer.h"

#include <stdio.h>

#include <charconv>

void LineBuffer::add(uint64_t number) {
    char* const to = room();
    wrote(std::to_chars(to, to + SLACK, number).ptr);
}

void LineBuffer::add_long(std::string_view text) {
    flush();
    if (text.size() <= SIZE) {
        add(text);
    } else {
        fwrite(text.data(), 1, text.size(), stdout);
    }
}

void LineBuffer::flush() {
    m_good = fwrite(m_bytes.data(), 1, m_len, stdout) == m_len && m_good;
    m_len = 0;
}
