// SPDX-License-Identifier: Apache-2.0
// What the kernel tells about a running process.
#ifndef BENCH_PROCESS_FIGURES_H_
#define BENCH_PROCESS_FIGURES_H_

#include <stdint.h>
#include <sys/types.h>

// CPU time of all its threads that still run, in seconds.
double process_cpu(pid_t pid);
// A number of its status file: VmRSS, VmHWM (in KiB), voluntary_ctxt_switches, ... 0 if there
// is none.
uint64_t process_status(pid_t pid, const char* field);

#endif  // BENCH_PROCESS_FIGURES_H_
