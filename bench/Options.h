// SPDX-License-Identifier: Apache-2.0
// What the benchmark is asked for.
#ifndef BENCH_OPTIONS_H_
#define BENCH_OPTIONS_H_

#include <stdint.h>

#include <string>
#include <vector>

struct TableMaker;

struct Options {
    uint64_t mib = 256;  // through the log path
    int rounds = 5;
    bool quick = false;
    bool spread = false;                    // over all CPUs
    std::vector<const TableMaker*> tables;  // in the order in which they are printed
    std::string dir;                        // where the tables' directories are made
    std::string service;                    // program

    // A number of files, requests or bytes: a tenth of it when it has to be quick.
    uint64_t scaled(uint64_t full) const { return quick ? full / 10 : full; }
    // A program that is built beside the benchmark.
    std::string built(const char* name) const;
};

// Fills in what is not asked for. False when the command line is wrong.
bool parse_options(int argc, char** argv, Options& options);

#endif  // BENCH_OPTIONS_H_
