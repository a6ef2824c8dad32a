// SPDX-License-Identifier: Apache-2.0
// The tables that the benchmark can print. Each is a file of its own with one function, and
// its row in tables.cpp.
#ifndef BENCH_TABLES_H_
#define BENCH_TABLES_H_

#include <string>
#include <vector>

#include "bench/Options.h"

// The exit status: of several tables the largest counts.
enum Outcome { REACHED = 0, MISSED = 1, NOT_MEASURED = 2 };

struct TableMaker {
    const char* name;  // on the command line
    bool by_default;
    // Measures in the directory, which is removed afterwards, and prints.
    Outcome (*run)(const Options& options, const std::string& dir);
};

// Null if there is none of this name.
const TableMaker* find_table(const std::string& name);
std::vector<const TableMaker*> default_tables();

#endif  // BENCH_TABLES_H_
