// SPDX-License-Identifier: Apache-2.0

#include "sim/TimeService.h"

#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>

#include "sim/local_socket.h"

bool TimeService::start(const std::string& root) {
    stop();
    m_listen = listen_local("cp_time_sync_server", root);
    if (m_listen < 0 || pipe2(m_wake, O_CLOEXEC) != 0) {
        const int error = errno;
        stop();
        errno = error;
        return false;
    }
    m_thread = std::thread(&TimeService::run, this);
    return true;
}

void TimeService::stop() {
    if (m_wake[1] >= 0) {
        close(m_wake[1]);
        m_wake[1] = -1;
    }
    if (m_thread.joinable()) {
        m_thread.join();
    }
    for (int* fd : {&m_listen, &m_wake[0]}) {
        if (*fd >= 0) {
            close(*fd);
            *fd = -1;
        }
    }
}

void TimeService::run() {
    pollfd p[2] = {{m_wake[0], POLLIN, 0}, {m_listen, POLLIN, 0}};
    for (;;) {
        if (poll(p, 2, -1) < 0) {
            continue;
        }
        if (p[0].revents != 0) {
            return;
        }
        const int fd = accept4(m_listen, nullptr, nullptr, SOCK_CLOEXEC);
        if (fd >= 0) {
            answer(fd);
            close(fd);
        }
    }
}

void TimeService::answer(int fd) {
    pollfd wake = {m_wake[0], POLLIN, 0};
    if (m_delay_ms > 0 && poll(&wake, 1, m_delay_ms) > 0) {
        return;
    }
    std::string reply = m_reply;
    if (reply.empty()) {
        const uint32_t now =
            m_seconds != 0 ? m_seconds.load() : static_cast<uint32_t>(time(nullptr));
        const uint64_t count = m_served + 1u;
        for (size_t i = 0; i < 4; ++i) {
            reply += static_cast<char>(now >> (8 * i));
        }
        for (size_t i = 0; i < 8; ++i) {
            reply += static_cast<char>(count >> (8 * i));
        }
        reply.resize(std::min(m_reply_size.load(), reply.size()));
    }
    if (send(fd, reply.data(), reply.size(), MSG_NOSIGNAL) == static_cast<ssize_t>(reply.size())) {
        ++m_served;
    }
}
