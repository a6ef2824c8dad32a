// SPDX-License-Identifier: Apache-2.0

#include "channels/TimeSyncClient.h"

#include <cutils/sockets.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include "core/SavedErrno.h"
#include "core/system_paths.h"

TimeSyncClient::~TimeSyncClient() {
    if (m_fd >= 0) {
        const SavedErrno fault_errno;
        close(m_fd);
    }
}

TimeSyncClient::Fault TimeSyncClient::ask(uint8_t (&reply)[TIME_SYNC_REPLY_LEN]) {
    if (!connect()) {
        return TSF_NO_CONNECTION;
    }
    // Again, for a platform that opens the socket without the flag.
    const int flags = fcntl(m_fd, F_GETFL);
    if (flags == -1) {
        return TSF_NO_FLAGS;
    }
    if (fcntl(m_fd, F_SETFL, flags | O_NONBLOCK) == -1) {
        return TSF_FLAGS_NOT_SET;
    }
    return read_reply(reply) ? TSF_NONE : TSF_NO_REPLY;
}

bool TimeSyncClient::connect() {
    while (m_left_ms > 0) {
        // Non-blocking: connecting to a service that hangs, its queue full, would wait.
        m_fd = socket_local_client(SOCKET_TIME_SYNC, ANDROID_SOCKET_NAMESPACE_ABSTRACT,
                                   SOCK_STREAM | SOCK_NONBLOCK);
        if (m_fd >= 0) {
            return true;
        }
        const SavedErrno connect_errno;
        usleep(ATTEMPT_MS * 1000);
        m_left_ms -= ATTEMPT_MS;
    }
    return false;
}

bool TimeSyncClient::read_reply(uint8_t (&reply)[TIME_SYNC_REPLY_LEN]) {
    struct pollfd pfd;
    pfd.fd = m_fd;
    pfd.events = POLLIN;
    pfd.revents = 0;
    return poll(&pfd, 1, m_left_ms) > 0 && (pfd.revents & POLLIN) &&
           read(m_fd, reply, sizeof(reply)) == static_cast<ssize_t>(sizeof(reply));
}
