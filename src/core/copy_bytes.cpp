// SPDX-License-Identifier: Apache-2.0

#include "core/copy_bytes.h"

#include <errno.h>
#include <unistd.h>

#include <algorithm>

int copy_bytes(int src, int dst, uint8_t* buffer, size_t buffer_size, uint64_t limit,
               uint64_t& copied) {
    copied = 0;
    while (copied < limit) {
        const size_t wanted = static_cast<size_t>(std::min<uint64_t>(buffer_size, limit - copied));
        const ssize_t n = read(src, buffer, wanted);
        if (n <= 0) {
            return static_cast<int>(n);
        }
        const ssize_t written = write(dst, buffer, static_cast<size_t>(n));
        if (written > 0) {
            copied += static_cast<uint64_t>(written);
        }
        if (written != n) {
            errno = written < 0 ? errno : ENOSPC;
            return COPY_NOT_TAKEN;
        }
    }
    return 0;
}
