// SPDX-License-Identifier: Apache-2.0
// The measurements. Each is a file of its own with one function, and its row of the table in
// measurements.cpp.
#ifndef BENCH_MEASUREMENTS_H_
#define BENCH_MEASUREMENTS_H_

#include <string>

#include "bench/Options.h"

struct Measurement {
    const char* option;  // asks for it; null for the one that runs without being asked for
    // Works in the directory, which goes at the end. Its result is the exit status: 0 within
    // the limits, 1 not, 2 could not measure.
    int (*run)(const Options& options, const std::string& dir);
};

// The one that the option asks for (null: the one without an option); null if there is none.
const Measurement* find_measurement(const char* option);

#endif  // BENCH_MEASUREMENTS_H_
