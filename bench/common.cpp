// SPDX-License-Identifier: Apache-2.0

#include "bench/common.h"

#include <errno.h>
#include <poll.h>
#include <stdio.h>
#include <string.h>

volatile sig_atomic_t g_interrupted = 0;

double read_clock(clockid_t clock) {
    struct timespec t;
    clock_gettime(clock, &t);
    return static_cast<double>(t.tv_sec) + static_cast<double>(t.tv_nsec) / 1e9;
}

void sleep_ms(int ms) {
    poll(nullptr, 0, ms);
}

bool fail(const char* what, const std::string& name) {
    fprintf(stderr, "bench_log_path: %s %s: %s\n", what, name.c_str(), strerror(errno));
    return false;
}
