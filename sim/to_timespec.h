// SPDX-License-Identifier: Apache-2.0
// A time in nanoseconds as the C library has it, whose fields may have 32 bits.
#ifndef SIM_TO_TIMESPEC_H_
#define SIM_TO_TIMESPEC_H_

#include <stdint.h>
#include <time.h>

inline timespec to_timespec(int64_t ns) {
    timespec time = {};
    time.tv_sec = static_cast<time_t>(ns / 1000000000);
    time.tv_nsec = static_cast<decltype(time.tv_nsec)>(ns % 1000000000);
    return time;
}

#endif  // SIM_TO_TIMESPEC_H_
