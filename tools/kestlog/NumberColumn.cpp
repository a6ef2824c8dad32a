// SPDX-License-Identifier: Apache-2.0

#include "kestlog/NumberColumn.h"

#include <algorithm>
#include <charconv>

// The last digits behind others, and those of a number that has no others.
struct NumberColumn::Table {
    char all[LAST][DIGITS];
    char left[LAST][DIGITS];
    char right[LAST][DIGITS];

    Table() {
        memset(left, ' ', sizeof(left));
        memset(right, ' ', sizeof(right));
        for (size_t number = 0; number < LAST; ++number) {
            char digits[DIGITS];
            char* const end = std::to_chars(digits, digits + DIGITS, number).ptr;
            memset(all[number], '0', DIGITS);
            std::copy_backward(digits, end, all[number] + DIGITS);
            std::copy(digits, end, left[number]);
            std::copy_backward(digits, end, right[number] + DIGITS);
        }
    }
};

const NumberColumn::Table NumberColumn::m_table;

void NumberColumn::keep(uint64_t high) {
    char digits[ROOM];
    char* const end = high ? std::to_chars(digits, digits + ROOM, high).ptr : digits;
    const size_t len = static_cast<size_t>(end - digits);
    m_high = high;
    m_len = std::max(len + DIGITS, m_width);
    m_last_at = m_align == LEFT ? len : m_len - DIGITS;
    m_last = high ? m_table.all : m_align == LEFT ? m_table.left : m_table.right;
    memset(m_field, ' ', ROOM);
    std::copy_backward(digits, end, m_field + m_last_at);
}
