// SPDX-License-Identifier: Apache-2.0
// What all measurements use.
#ifndef BENCH_COMMON_H_
#define BENCH_COMMON_H_

#include <signal.h>
#include <stdint.h>
#include <time.h>

#include <string>

constexpr uint64_t MIB = 1 << 20;
constexpr unsigned FILE_MIB = 5;  // of a log file
constexpr int START_TIMEOUT_MS = 5000;

// Set by a signal that wants the benchmark to end.
extern volatile sig_atomic_t g_interrupted;

// Seconds on the clock.
double read_clock(clockid_t clock);
void sleep_ms(int ms);
// Says what failed with errno's text; false.
bool fail(const char* what, const std::string& name);

#endif  // BENCH_COMMON_H_
