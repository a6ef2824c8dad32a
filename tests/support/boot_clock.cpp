// SPDX-License-Identifier: Apache-2.0

#include "support/boot_clock.h"

#include <errno.h>
#include <time.h>

namespace {

enum Mode { REAL, FROZEN, FAILING };
Mode g_mode = REAL;
struct timespec g_now = {1000, 999999999};

}  // namespace

namespace boot_clock {

void real() {
    g_mode = REAL;
}

void freeze() {
    g_mode = FROZEN;
}

void advance(unsigned int ms) {
    const long ns = g_now.tv_nsec + static_cast<long>(ms % 1000) * 1000000;
    g_now.tv_sec += static_cast<time_t>(ms / 1000) + ns / 1000000000;
    g_now.tv_nsec = ns % 1000000000;
}

void fail() {
    g_mode = FAILING;
}

}  // namespace boot_clock

extern "C" int __real_clock_gettime(clockid_t id, struct timespec* now);
extern "C" int __wrap_clock_gettime(clockid_t id, struct timespec* now);
extern "C" int __wrap_clock_gettime(clockid_t id, struct timespec* now) {
    if (id != CLOCK_BOOTTIME || g_mode == REAL) {
        return __real_clock_gettime(id, now);
    }
    if (g_mode == FAILING) {
        errno = EINVAL;
        return -1;
    }
    *now = g_now;
    return 0;
}
