// SPDX-License-Identifier: Apache-2.0

#include "kestlog/LineBuffer.h"

#include <stdio.h>
#include <stdlib.h>

#include <algorithm>
#include <charconv>

void LineBuffer::add(uint64_t number, int width) {
    constexpr size_t MAX_DIGITS = 20;
    static_assert(2 * MAX_DIGITS <= SLACK, "a number fits");
    char field[3 * MAX_DIGITS];
    memset(field, ' ', sizeof(field));
    char* const digits = field + MAX_DIGITS;
    const size_t len =
        static_cast<size_t>(std::to_chars(digits, digits + MAX_DIGITS, number).ptr - digits);
    const size_t wide = std::max(len, std::min(static_cast<size_t>(abs(width)), MAX_DIGITS));
    make_room();
    // Always so many: a copy of a fixed length is faster.
    memcpy(m_bytes.data() + m_len, width > 0 ? digits + len - wide : digits, 2 * MAX_DIGITS);
    m_len += wide;
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
