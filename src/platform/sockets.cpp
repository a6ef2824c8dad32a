// SPDX-License-Identifier: Apache-2.0

#include <cutils/sockets.h>
#include <errno.h>
#include <stddef.h>
#include <stdlib.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include "platform/env_root.h"

namespace {

// Clients that may wait for accept; the next one waits in connect.
const int LISTEN_BACKLOG = 16;

struct Address {
    struct sockaddr_un un;
    socklen_t len;

    bool append(const char* text) {
        const size_t used = len - offsetof(struct sockaddr_un, sun_path);
        const size_t text_len = strlen(text);
        if (text_len > sizeof(un.sun_path) - used) {
            errno = ENAMETOOLONG;
            return false;
        }
        memcpy(un.sun_path + used, text, text_len);
        len += static_cast<socklen_t>(text_len);
        return true;
    }
};

bool make_address(const char* name, int namespace_id, Address& address) {
    if (namespace_id != ANDROID_SOCKET_NAMESPACE_ABSTRACT || !name || !*name) {
        errno = EINVAL;
        return false;
    }
    memset(&address.un, 0, sizeof(address.un));
    address.un.sun_family = AF_UNIX;
    // An abstract name begins after one NUL and ends where the address ends.
    address.len = static_cast<socklen_t>(offsetof(struct sockaddr_un, sun_path) + 1);
    if (!address.append(name)) {
        return false;
    }
    const char* root = getenv(ENV_ROOT);
    return !root || !*root || (address.append("@") && address.append(root));
}

int close_failed(int fd) {
    const int saved_errno = errno;
    close(fd);
    errno = saved_errno;
    return -1;
}

}  // namespace

int socket_local_server(const char* name, int namespaceId, int type) {
    Address address;
    if (!make_address(name, namespaceId, address)) {
        return -1;
    }
    const int fd = socket(AF_UNIX, type | SOCK_CLOEXEC, 0);
    if (fd < 0) {
        return -1;
    }
    if (bind(fd, reinterpret_cast<const struct sockaddr*>(&address.un), address.len) < 0) {
        return close_failed(fd);
    }
    const bool connected = (type & ~(SOCK_CLOEXEC | SOCK_NONBLOCK)) != SOCK_DGRAM;
    if (connected && listen(fd, LISTEN_BACKLOG) < 0) {
        return close_failed(fd);
    }
    return fd;
}

int socket_local_client(const char* name, int namespaceId, int type) {
    Address address;
    if (!make_address(name, namespaceId, address)) {
        return -1;
    }
    const int fd = socket(AF_UNIX, type | SOCK_CLOEXEC, 0);
    if (fd < 0) {
        return -1;
    }
    int result;
    do {
        // Interrupted while the server's queue was full, the socket is still unconnected.
        result = connect(fd, reinterpret_cast<const struct sockaddr*>(&address.un), address.len);
    } while (result < 0 && errno == EINTR);
    return result < 0 ? close_failed(fd) : fd;
}
