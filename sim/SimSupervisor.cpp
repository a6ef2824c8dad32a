// SPDX-License-Identifier: Apache-2.0

#include "sim/SimSupervisor.h"

#include <errno.h>
#include <sys/socket.h>
#include <unistd.h>

#include "sim/local_socket.h"

bool SimSupervisor::start(const std::string& name, const std::string& root) {
    stop();
    m_accepted = 0;
    m_listen = listen_local(name, root);
    return m_listen >= 0;
}

void SimSupervisor::stop() {
    drop();
    if (m_listen >= 0) {
        close(m_listen);
        m_listen = -1;
    }
}

bool SimSupervisor::connected() {
    // The newest connection counts: the service has closed the ones before it.
    int fd;
    while (m_listen >= 0 && (fd = accept4(m_listen, nullptr, nullptr, SOCK_CLOEXEC)) >= 0) {
        drop();
        m_fd = fd;
        ++m_accepted;
    }
    char byte;
    if (m_fd >= 0) {
        const ssize_t n = recv(m_fd, &byte, 1, MSG_PEEK | MSG_DONTWAIT);
        if (n == 0 || (n < 0 && errno != EAGAIN && errno != EINTR)) {
            drop();
        }
    }
    return m_fd >= 0;
}

bool SimSupervisor::wait_connected(int timeout_ms) {
    for (; !connected(); --timeout_ms) {
        if (timeout_ms <= 0) {
            return false;
        }
        usleep(1000);
    }
    return true;
}

bool SimSupervisor::send(const std::string& text) {
    return connected() && ::send(m_fd, text.data(), text.size(), MSG_NOSIGNAL) ==
                              static_cast<ssize_t>(text.size());
}

void SimSupervisor::drop() {
    if (m_fd >= 0) {
        close(m_fd);
        m_fd = -1;
    }
}
