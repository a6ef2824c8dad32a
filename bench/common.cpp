// SPDX-License-Identifier: Apache-2.0

#include "bench/common.h"

#include <errno.h>
#include <poll.h>
#include <sched.h>
#include <stdio.h>
#include <string.h>

volatile sig_atomic_t g_interrupted = 0;

double read_clock(clockid_t clock) {
    struct timespec t;
    clock_gettime(clock, &t);
    return static_cast<double>(t.tv_sec) + static_cast<double>(t.tv_nsec) / 1e9;
}

double now() {
    return read_clock(CLOCK_MONOTONIC);
}

double own_cpu() {
    return read_clock(CLOCK_THREAD_CPUTIME_ID);
}

void sleep_ms(int ms) {
    poll(nullptr, 0, ms);
}

void stay_on_this_cpu() {
    cpu_set_t one;
    CPU_ZERO(&one);
    CPU_SET(sched_getcpu(), &one);
    sched_setaffinity(0, sizeof(one), &one);
}

bool fail(const std::string& what, const std::string& name) {
    fprintf(stderr, "bench: %s %s: %s\n", what.c_str(), name.c_str(), strerror(errno));
    return false;
}

void progress(const std::string& what, int round, int rounds) {
    fprintf(stderr, "%s: %s\n", what.c_str(),
            round ? ("round " + std::to_string(round) + " of " + std::to_string(rounds)).c_str()
                  : "round that does not count");
}
