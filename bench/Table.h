// SPDX-License-Identifier: Apache-2.0
// A table of figures in Markdown that can also be read as it is.
#ifndef BENCH_TABLE_H_
#define BENCH_TABLE_H_

#include <string>
#include <vector>

#include "bench/tables.h"

class Table {
public:
    // The first column is of words, the others are of numbers.
    Table(const std::string& title, const std::vector<std::string>& columns);

    void add_row(const std::vector<std::string>& cells);
    // A paragraph below the table.
    void add_note(const std::string& text) { m_notes.push_back(text); }
    // The same that tells whether the value is within the limit. print() returns MISSED when
    // one is not.
    void add_goal(const std::string& what, double value, double limit, int decimals);

    Outcome print() const;

private:
    const std::string m_title;
    std::vector<std::vector<std::string>> m_rows;  // the first one is the head
    std::vector<std::string> m_notes;
    bool m_reached = true;
};

// The number with so many decimals and a comma between thousands.
std::string number_text(double value, int decimals = 0);

#endif  // BENCH_TABLE_H_
