// SPDX-License-Identifier: Apache-2.0
// What the benchmark is asked for.
#ifndef BENCH_OPTIONS_H_
#define BENCH_OPTIONS_H_

#include <stddef.h>
#include <stdint.h>

#include <string>

struct Measurement;

struct Options {
    uint64_t mib = 1024;
    uint64_t kept_mib = 50;  // 0: everything
    size_t block = 65536;    // bytes a write to the FIFO
    int rounds = 3;
    bool spread = false;  // over all CPUs
    const Measurement* measurement = nullptr;
    std::string dir;
    std::string service;
};

// False when the command line is wrong.
bool parse_options(int argc, char** argv, Options& options);
// Where the measurements are made unless the options say it: a tmpfs with room for what is
// kept and some more, or the usual place.
std::string default_dir(const Options& options);

#endif  // BENCH_OPTIONS_H_
