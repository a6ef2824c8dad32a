// SPDX-License-Identifier: Apache-2.0

#include "bench/Table.h"

#include <ctype.h>
#include <stdio.h>

#include <algorithm>

Table::Table(const std::string& title, const std::vector<std::string>& columns)
    : m_title(title), m_rows({columns}) {}

void Table::add_row(const std::vector<std::string>& cells) {
    m_rows.push_back(cells);
    m_rows.back().resize(m_rows[0].size());
}

void Table::add_goal(const std::string& what, double value, double limit, int decimals) {
    const bool reached = value <= limit;
    m_reached = m_reached && reached;
    add_note("Goal: " + what + " at most " + number_text(limit, decimals) + ". It is " +
             number_text(value, decimals) + (reached ? ": reached." : ": MISSED."));
}

Outcome Table::print() const {
    printf("### %s\n\n", m_title.c_str());
    std::vector<size_t> widths(m_rows[0].size());
    for (const std::vector<std::string>& row : m_rows) {
        for (size_t i = 0; i < row.size(); ++i) {
            widths[i] = std::max(widths[i], row[i].size());
        }
    }
    for (size_t r = 0; r < m_rows.size(); ++r) {
        for (size_t i = 0; i < widths.size(); ++i) {
            const int width = static_cast<int>(widths[i]);
            printf(i == 0 ? "| %-*s |" : " %*s |", width, m_rows[r][i].c_str());
        }
        printf("\n");
        for (size_t i = 0; r == 0 && i < widths.size(); ++i) {
            printf(i == 0 ? "|-%s-|" : "-%s:|", std::string(widths[i], '-').c_str());
        }
        if (r == 0) {
            printf("\n");
        }
    }
    for (const std::string& note : m_notes) {
        printf("\n%s\n", note.c_str());
    }
    printf("\n");
    fflush(stdout);
    return m_reached ? REACHED : MISSED;
}

std::string number_text(double value, int decimals) {
    char digits[64];
    snprintf(digits, sizeof(digits), "%.*f", decimals, value);
    std::string text = digits;
    const size_t point = std::min(text.find('.'), text.size());
    for (size_t at = point; at > 3 && isdigit(text[at - 4]); at -= 3) {
        text.insert(at - 3, ",");
    }
    return text;
}
