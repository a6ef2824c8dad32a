// SPDX-License-Identifier: Apache-2.0
// What all tables use.
#ifndef BENCH_COMMON_H_
#define BENCH_COMMON_H_

#include <signal.h>
#include <stdint.h>
#include <time.h>

#include <string>

constexpr uint64_t MIB = 1 << 20;
constexpr uint64_t GIB = 1 << 30;
// The sizes of every log that is measured, also of other programs.
constexpr unsigned FILE_MIB = 5;
constexpr unsigned KEPT_MIB = 50;
constexpr int START_TIMEOUT_MS = 20000;

// Set by a signal that wants the benchmark to end.
extern volatile sig_atomic_t g_interrupted;

// Seconds on the clock.
double read_clock(clockid_t clock);
double now();      // of the steady clock
double own_cpu();  // CPU time of the calling thread
void sleep_ms(int ms);
// Lets the calling thread, and what it starts, run on the present CPU only.
void stay_on_this_cpu();

// Says what failed with errno's text; false.
bool fail(const std::string& what, const std::string& name);
// Says what is being measured.
void progress(const std::string& what, int round, int rounds);

#endif  // BENCH_COMMON_H_
