// SPDX-License-Identifier: Apache-2.0

#include "core/open_file.h"

#include <errno.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

int refuse(int fd, int error) {
    close(fd);
    errno = error;
    return -1;
}

// Raw flash, unlike any other character device.
bool has_size(int fd) {
    return lseek(fd, 0, SEEK_END) > 0 && lseek(fd, 0, SEEK_SET) == 0;
}

int open_checked(const char* path, int flags, Links links, bool partitions_too) {
    const int no_follow = links == Links::REFUSE ? O_NOFOLLOW : 0;
    // Nothing is cut before it is known what was opened.
    const int fd =
        open(path, (flags & ~O_TRUNC) | no_follow | O_NONBLOCK | O_NOCTTY | O_CLOEXEC, 0644);
    if (fd < 0) {
        return -1;
    }
    struct stat st;
    if (fstat(fd, &st) < 0) {
        return refuse(fd, errno);
    }
    const bool partition = S_ISBLK(st.st_mode) || (S_ISCHR(st.st_mode) && has_size(fd));
    if (!S_ISREG(st.st_mode) && !(partitions_too && partition)) {
        return refuse(fd, S_ISDIR(st.st_mode) ? EISDIR : EINVAL);
    }
    const bool writes = (flags & O_ACCMODE) != O_RDONLY;
    if (writes && links == Links::REFUSE && st.st_nlink > 1) {
        return refuse(fd, EMLINK);
    }
    if ((flags & O_TRUNC) && st.st_size > 0 && ftruncate(fd, 0) < 0) {
        return refuse(fd, errno);
    }
    // Only the opening must not wait. A file of the kernel may take the flag for a wish to
    // get a part of its content instead of all.
    const int status = fcntl(fd, F_GETFL);
    if (status < 0 || fcntl(fd, F_SETFL, status & ~O_NONBLOCK) < 0) {
        return refuse(fd, errno);
    }
    return fd;
}

}  // namespace

int open_to_read(const char* path, Links links) {
    return open_checked(path, O_RDONLY, links, true);
}

int open_to_write(const char* path, int flags, Links links) {
    return open_checked(path, flags, links, false);
}
