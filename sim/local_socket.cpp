// SPDX-License-Identifier: Apache-2.0

#include "sim/local_socket.h"

#include <errno.h>
#include <stddef.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

namespace {

using Attach = int (*)(int fd, const sockaddr* addr, socklen_t len);

int attach_local(const std::string& name, const std::string& root, Attach attach, int backlog) {
    const std::string full = name + "@" + root;
    sockaddr_un addr = {};
    addr.sun_family = AF_UNIX;
    // The abstract namespace: a NUL, then the name without a terminator.
    if (full.size() + 1 > sizeof addr.sun_path) {
        errno = ENAMETOOLONG;
        return -1;
    }
    memcpy(addr.sun_path + 1, full.data(), full.size());
    const auto len = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + 1 + full.size());
    const int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    if (fd >= 0 && (attach(fd, reinterpret_cast<sockaddr*>(&addr), len) != 0 ||
                    (backlog > 0 && listen(fd, backlog) != 0))) {
        const int error = errno;
        close(fd);
        errno = error;
        return -1;
    }
    return fd;
}

}  // namespace

int listen_local(const std::string& name, const std::string& root) {
    return attach_local(name, root, bind, 8);
}

int connect_local(const std::string& name, const std::string& root) {
    return attach_local(name, root, connect, 0);
}
