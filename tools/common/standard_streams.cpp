// SPDX-License-Identifier: Apache-2.0

#include "common/standard_streams.h"

#include <fcntl.h>
#include <unistd.h>

void hold_standard_streams() {
    for (int fd = STDIN_FILENO; fd <= STDERR_FILENO; ++fd) {
        if (fcntl(fd, F_GETFD) < 0) {
            // The lowest free descriptor is this one. The wrong way round, for it to fail.
            open("/dev/null", fd == STDIN_FILENO ? O_WRONLY : O_RDONLY);
        }
    }
}
