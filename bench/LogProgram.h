// SPDX-License-Identifier: Apache-2.0
// A program that copies a stream from its standard input into rotating log files.
#ifndef BENCH_LOGPROGRAM_H_
#define BENCH_LOGPROGRAM_H_

#include <stddef.h>
#include <stdint.h>

#include <string>
#include <vector>

#include "bench/Options.h"
#include "sim/ChildProcess.h"

// What one run of a stream through a program, or through the service, cost.
struct LogRun {
    bool ok = false;
    ChildProcess::Cost cost;
    double deleting_s = 0;  // CPU time of the benchmark for deleting old data in its place
    double wall_s = 0;
    uint64_t peak_kib = 0;  // VmHWM
};

struct LogProgram {
    const char* name;
    const char* package;  // of Debian; null when it is there anyway
    std::string command;  // of the shell, run in the directory of the log files
    // Deletes what is older than the quota, of a program that does not do so itself; is called
    // after each MiB, with the log files' directory and the MiB fed. Null: not needed.
    void (*trim)(const std::string& dir, uint64_t fed_mib);

    bool installed() const;
    // Sends the stream through it. What it prints is in the file "messages" of the directory.
    LogRun run(const std::string& dir, uint64_t mib, size_t block) const;
};

// The bare loop first.
std::vector<LogProgram> log_programs(const Options& options);

#endif  // BENCH_LOGPROGRAM_H_
