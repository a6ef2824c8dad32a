// SPDX-License-Identifier: Apache-2.0
// The three readers of a FIFO that are compared: cat, split and the service. Each keeps as
// much data as the options say.
#ifndef BENCH_LOG_READERS_H_
#define BENCH_LOG_READERS_H_

#include <string>

#include "bench/Options.h"
#include "sim/ChildProcess.h"

struct Result {
    bool ok = false;
    ChildProcess::Cost cost;
    double wall = 0;
    double deleting = 0;  // CPU time of the benchmark for the deletion of old data
    double cpu() const { return cost.user_s + cost.system_s; }
    double with_deleting() const { return cpu() + deleting; }
};

// One run in the directory, where cat and split find the FIFO "fifo".
Result run_cat(const Options& options, const std::string& dir);
Result run_split(const Options& options, const std::string& dir);
Result run_service(const Options& options, const std::string& dir);

#endif  // BENCH_LOG_READERS_H_
