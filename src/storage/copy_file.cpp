// SPDX-License-Identifier: Apache-2.0

#include "storage/copy_file.h"

#include <errno.h>
#include <fcntl.h>
#include <stddef.h>
#include <unistd.h>

#include "core/SavedErrno.h"
#include "core/log.h"
#include "core/open_file.h"

namespace {

const size_t COPY_BUF_SIZE = 32768;

int copy_content(int src_fd, int dst_fd) {
    static char buf[COPY_BUF_SIZE];
    for (;;) {
        const ssize_t n = read(src_fd, buf, sizeof(buf));
        if (n <= 0) {
            return static_cast<int>(n);
        }
        const ssize_t written = write(dst_fd, buf, static_cast<size_t>(n));
        if (written != n) {
            errno = written < 0 ? errno : ENOSPC;
            return -1;
        }
    }
}

}  // namespace

int copy_file(const char* src, const char* dst) {
    const int src_fd = open_to_read(src, Links::FOLLOW);
    if (src_fd < 0) {
        err_log("open source file %s failed", src);
        return -1;
    }
    const int dst_fd = open_to_write(dst, O_WRONLY | O_CREAT | O_TRUNC, Links::FOLLOW);
    if (dst_fd < 0) {
        err_log("open dest file %s failed", dst);
        close(src_fd);
        return -1;
    }
    const int result = copy_content(src_fd, dst_fd);
    const SavedErrno keep;
    close(dst_fd);
    close(src_fd);
    return result;
}
