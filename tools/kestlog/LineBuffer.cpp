// SPDX-License-Identifier: Apache-2.0

#include "kestlog/LineBuffer.h"

#include <stdio.h>
#include <stdlib.h>

#include <algorithm>
#include <charconv>

void LineBuffer::add(uint64_t number, int width) {
    constexpr size_t MAX_DIGITS = 20;
    char field[2 * MAX_DIGITS];
    memset(field, ' ', sizeof(field));
    char* const digits = field + MAX_DIGITS;
    char* const end = std::to_chars(digits, digits + MAX_DIGITS, number).ptr;
    const size_t len = static_cast<size_t>(end - digits);
    const size_t wide = std::max(len, std::min(static_cast<size_t>(abs(width)), MAX_DIGITS));
    add({width > 0 ? end - wide : digits, wide});
}

void LineBuffer::add_long(std::string_view text) {
    flush();
    if (text.size() <= SIZE) {
        add(text);
    } else {
        fwrite(text.data(), 1, text.size(), stdout);
    }
}

bool LineBuffer::end_line() {
    add("\n");
    return ferror(stdout) == 0;
}

void LineBuffer::flush() {
    fwrite(m_bytes.data(), 1, m_len, stdout);
    m_len = 0;
}
