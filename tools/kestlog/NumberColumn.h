// SPDX-License-Identifier: Apache-2.0
// A column of numbers in lines of which there are millions. Most numbers differ from the one above
// in their last digits only, so the text of the others is kept. Owned by who prints the lines.
#ifndef KESTLOG_NUMBERCOLUMN_H_
#define KESTLOG_NUMBERCOLUMN_H_

#include <stddef.h>
#include <stdint.h>
#include <string.h>

class NumberColumn {
public:
    enum Align { LEFT, RIGHT };

    // What write() may touch.
    static constexpr size_t ROOM = 24;

    // With blanks before or behind the numbers up to the width, which is from 4 to ROOM.
    NumberColumn(Align align, size_t width) : m_align(align), m_width(width) {}

    // Writes the number in decimal; its end, with the blanks.
    char* write(uint64_t number, char* to) {
        if (number / LAST != m_high) {
            keep(number / LAST);
        }
        memcpy(to, m_field, ROOM);
        memcpy(to + m_last_at, m_last[number % LAST], DIGITS);
        return to + m_len;
    }

private:
    static constexpr size_t DIGITS = 4;  // at the end, which are looked up
    static constexpr size_t LAST = 10000;
    struct Table;
    static const Table m_table;

    void keep(uint64_t high);

    const Align m_align;
    const size_t m_width;
    uint64_t m_high = UINT64_MAX;  // the number without its last digits
    char m_field[ROOM];            // for all numbers with these
    size_t m_len = 0;
    size_t m_last_at = 0;
    const char (*m_last)[DIGITS] = nullptr;  // the last digits
};

#endif  // KESTLOG_NUMBERCOLUMN_H_
