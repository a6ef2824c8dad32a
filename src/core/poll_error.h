// SPDX-License-Identifier: Apache-2.0
// What a loop does after a poll that failed. One that wants memory fails at once, however
// often it is tried: without a pause the loop would take a whole processor.
#ifndef CORE_POLL_ERROR_H_
#define CORE_POLL_ERROR_H_

#include <errno.h>
#include <unistd.h>

constexpr unsigned int POLL_FAILED_WAIT_US = 100000;

// Waits, unless the error of the poll was just a signal.
inline void wait_after_failed_poll(int error) {
    if (error != EINTR) {
        usleep(POLL_FAILED_WAIT_US);
    }
}

#endif  // CORE_POLL_ERROR_H_
