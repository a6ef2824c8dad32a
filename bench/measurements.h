// SPDX-License-Identifier: Apache-2.0
// The measurements, each in a file of its own. Exit status: 0 within the limits, 1 not,
// 2 could not measure.
#ifndef BENCH_MEASUREMENTS_H_
#define BENCH_MEASUREMENTS_H_

#include <string>

#include "bench/Options.h"

// They work in the directory, which goes at the end.
int measure_log_path(const Options& options, const std::string& dir);
int count_system_calls(const Options& options, const std::string& dir);

#endif  // BENCH_MEASUREMENTS_H_
