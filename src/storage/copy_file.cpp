#include "storage/copy_file.h"

#include <fcntl.h>
#include <stddef.h>
#include <unistd.h>

#include "core/log.h"

namespace {

const size_t COPY_BUF_SIZE = 32768;

int copy_content(int src_fd, int dst_fd) {
    static char buf[COPY_BUF_SIZE];
    for (;;) {
        const ssize_t n = read(src_fd, buf, sizeof(buf));
        if (n <= 0) {
            return static_cast<int>(n);
        }
        if (write(dst_fd, buf, static_cast<size_t>(n)) != n) {
            return -1;
        }
    }
}

}  // namespace

int copy_file(const char* src, const char* dst) {
    const int src_fd = open(src, O_RDONLY | O_CLOEXEC);
    if (src_fd < 0) {
        err_log("open source file %s failed", src);
        return -1;
    }
    const int dst_fd = open(dst, O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    if (dst_fd < 0) {
        err_log("open dest file %s failed", dst);
        close(src_fd);
        return -1;
    }
    const int result = copy_content(src_fd, dst_fd);
    close(dst_fd);
    close(src_fd);
    return result;
}
