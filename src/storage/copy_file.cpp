// SPDX-License-Identifier: Apache-2.0

#include "storage/copy_file.h"

#include <fcntl.h>
#include <stddef.h>
#include <stdint.h>
#include <unistd.h>

#include "core/SavedErrno.h"
#include "core/copy_bytes.h"
#include "core/log.h"
#include "core/open_file.h"

namespace {

const size_t COPY_BUF_SIZE = 32768;

}  // namespace

int copy_file(const char* src, const char* dst) {
    const int src_fd = open_to_read(src, Links::FOLLOW);
    if (src_fd < 0) {
        err_log("open source file %s failed", src);
        return -1;
    }
    const int dst_fd = open_to_write(dst, O_WRONLY | O_CREAT | O_TRUNC, Links::REFUSE);
    if (dst_fd < 0) {
        err_log("open dest file %s failed", dst);
        close(src_fd);
        return -1;
    }
    static uint8_t buffer[COPY_BUF_SIZE];
    uint64_t copied;
    const int result = copy_bytes(src_fd, dst_fd, buffer, sizeof(buffer), UINT64_MAX, copied);
    const SavedErrno keep;
    close(dst_fd);
    close(src_fd);
    return result < 0 ? -1 : 0;
}
