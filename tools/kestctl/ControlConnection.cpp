// SPDX-License-Identifier: Apache-2.0

#include "kestctl/ControlConnection.h"

#include <cutils/sockets.h>
#include <errno.h>
#include <limits.h>
#include <poll.h>
#include <stdio.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>

#include "core/system_paths.h"
#include "kestctl/ExitStatus.h"

namespace {

// The time between attempts to connect while the service's queue is full.
const int CONNECT_RETRY_MS = 50;

// The full name of the socket: on a host the root is part of it.
std::string socket_name() {
    const std::string root = system_path("").string();
    return root.empty() ? SOCKET_CONTROL : SOCKET_CONTROL "@" + root;
}

}  // namespace

ControlConnection::~ControlConnection() {
    if (m_fd >= 0) {
        close(m_fd);
    }
}

int ControlConnection::open(double timeout) {
    m_timeout = timeout;
    clock_gettime(CLOCK_MONOTONIC, &m_opened);
    m_waits_in_queue = true;
    for (;;) {
        m_fd = socket_local_client(SOCKET_CONTROL, ANDROID_SOCKET_NAMESPACE_ABSTRACT,
                                   SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC);
        if (m_fd >= 0) {
            return ES_OK;
        }
        if (errno != EAGAIN) {
            return fail(ES_NO_CONNECTION, std::string("no connection to the control socket ") +
                                              socket_name() + " (" + strerror(errno) +
                                              "): is the service running?");
        }
        // The queue of waiting clients is full; poll cannot wait for room in it.
        const int status = wait_for(-1, 0, CONNECT_RETRY_MS);
        if (status != ES_OK) {
            return status;
        }
    }
}

int ControlConnection::request(const std::string& line, std::string* reply) {
    const int status = send_line(line);
    return status == ES_OK ? read_reply(reply) : status;
}

int ControlConnection::listen() {
    std::string line;
    const int status = read_reply(&line);
    return status == ES_OK ? fail(ES_BAD_REPLY, "unexpected line from the service: " + line)
                           : status;
}

int ControlConnection::send_line(const std::string& line) {
    const std::string data = line + "\n";
    for (size_t sent = 0; sent < data.size();) {
        const ssize_t n = send(m_fd, data.data() + sent, data.size() - sent, MSG_NOSIGNAL);
        if (n >= 0) {
            sent += static_cast<size_t>(n);
        } else if (errno == EAGAIN) {
            const int status = wait_for(m_fd, POLLOUT, INT_MAX);
            if (status != ES_OK) {
                return status;
            }
        } else if (errno != EINTR) {
            return closed();
        }
    }
    return ES_OK;
}

int ControlConnection::read_reply(std::string* line) {
    Notification notification;
    for (;;) {
        const int status = read_line(line);
        if (status != ES_OK || !parse_notification(*line, &notification)) {
            return status;
        }
        if (m_listener && !m_listener(notification)) {
            return fail(ES_OUTPUT, std::string("standard output: ") + strerror(errno));
        }
    }
}

int ControlConnection::read_line(std::string* line) {
    for (;;) {
        const size_t end = m_data.find('\n');
        if (std::min(end, m_data.size()) > MAX_LINE) {
            return fail(ES_BAD_REPLY, "the service sent a line that is too long");
        }
        if (end != std::string::npos) {
            *line = m_data.substr(0, end);
            m_data.erase(0, end + 1);
            return ES_OK;
        }
        const int status = wait_for(m_fd, POLLIN, INT_MAX);
        if (status != ES_OK) {
            return status;
        }
        char buf[MAX_LINE];
        const ssize_t n = read(m_fd, buf, sizeof(buf));
        if (n == 0 || (n < 0 && errno != EAGAIN && errno != EINTR)) {
            return closed();
        }
        if (n > 0) {
            m_waits_in_queue = false;
            m_data.append(buf, static_cast<size_t>(n));
        }
    }
}

int ControlConnection::wait_for(int fd, short events, int max_ms) {
    int wait_ms = max_ms == INT_MAX ? -1 : max_ms;
    if (m_timeout > 0) {
        struct timespec now;
        clock_gettime(CLOCK_MONOTONIC, &now);
        const double passed = static_cast<double>(now.tv_sec - m_opened.tv_sec) +
                              static_cast<double>(now.tv_nsec - m_opened.tv_nsec) / 1e9;
        const double left_ms = (m_timeout - passed) * 1000;
        if (left_ms <= 0) {
            return timed_out();
        }
        // Rounded up, so that the deadline has passed when poll times out.
        wait_ms = std::min(max_ms, static_cast<int>(std::min(left_ms, INT_MAX / 2.0)) + 1);
    }
    struct pollfd pfd = {fd, events, 0};
    const int n = poll(&pfd, 1, wait_ms);
    if (n < 0 && errno != EINTR) {
        return fail(ES_NO_CONNECTION, std::string("poll: ") + strerror(errno));
    }
    // Whether it is ready now the caller finds out by trying again.
    return ES_OK;
}

int ControlConnection::fail(int status, const std::string& words) {
    m_failure = words;
    return status;
}

int ControlConnection::closed() {
    return fail(ES_BAD_REPLY, m_data.empty()
                                  ? "the service closed the connection"
                                  : "the service closed the connection in the middle of a line");
}

int ControlConnection::timed_out() {
    char words[160];
    snprintf(words, sizeof(words), "no reply within %g s%s", m_timeout,
             m_waits_in_queue ? ": the service is busy, or it already serves three clients, "
                                "which is its limit, and this one has to wait"
                              : "");
    return fail(ES_TIMEOUT, words);
}
