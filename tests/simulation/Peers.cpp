// SPDX-License-Identifier: Apache-2.0

#include "simulation/Peers.h"

#include <errno.h>
#include <poll.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include "sim/local_socket.h"
#include "simulation/Calls.h"

namespace {

const char* const SUPERVISOR_NAMES[] = {"modemd", "external_wcn_kest"};
constexpr size_t MAX_TIME_FDS = 8;

void close_fd(int& fd) {
    if (fd >= 0) {
        close(fd);
    }
    fd = -1;
}

}  // namespace

Peers::Peers(const std::string& root) : m_root(root) {
    for (unsigned i = 0; i < SUPERVISORS; ++i) {
        if (!g_state->supervisor_gone[i]) {
            supervisor_comes(i);
        }
    }
    m_time = listen_at("cp_time_sync_server");
}

Peers::~Peers() {
    for (unsigned i = 0; i < SUPERVISORS; ++i) {
        close_fd(m_listen[i]);
        close_fd(m_fd[i]);
    }
    close_fd(m_time);
    for (int& fd : m_time_fds) {
        close_fd(fd);
    }
}

int Peers::listen_at(const char* name) const {
    const int fd = listen_local(name, m_root);
    if (fd < 0) {
        fail_run("simulation", "cannot listen as %s: %s", name, strerror(errno));
    }
    return fd;
}

void Peers::pump() {
    // One look at all: an accept that finds nobody costs more.
    struct pollfd fds[SUPERVISORS + 1] = {
        {m_listen[0], POLLIN, 0}, {m_listen[1], POLLIN, 0}, {m_time, POLLIN, 0}};
    if (poll(fds, SUPERVISORS + 1, 0) <= 0) {
        return;
    }
    for (unsigned i = 0; i < SUPERVISORS; ++i) {
        const int fd = m_listen[i] < 0 ? -1 : accept4(m_listen[i], nullptr, nullptr, SOCK_NONBLOCK);
        if (fd >= 0) {
            close_fd(m_fd[i]);
            m_fd[i] = fd;
        }
    }
    int fd;
    while ((fd = accept4(m_time, nullptr, nullptr, SOCK_NONBLOCK)) >= 0) {
        const uint8_t reply[12] = {0x10, 0x20, 0x30, 0x50, 1, 2, 3, 4, 5, 6, 7, 8};
        const uint32_t how = g_state->time_answers;
        if (how == TIME_PROMPT || how == TIME_SHORT) {
            send(fd, reply, how == TIME_SHORT ? 5 : sizeof(reply), MSG_NOSIGNAL);
        }
        if (how == TIME_HANGS_UP) {
            close(fd);
            continue;
        }
        m_time_fds.push_back(fd);
        if (m_time_fds.size() > MAX_TIME_FDS) {
            close(m_time_fds.front());
            m_time_fds.erase(m_time_fds.begin());
        }
    }
}

void Peers::supervisor_says(unsigned supervisor, const std::string& text) {
    if (m_fd[supervisor] >= 0) {
        send(m_fd[supervisor], text.data(), text.size(), MSG_NOSIGNAL);
    }
}

void Peers::supervisor_drops(unsigned supervisor) {
    close_fd(m_fd[supervisor]);
}

void Peers::supervisor_goes(unsigned supervisor) {
    g_state->supervisor_gone[supervisor] = true;
    close_fd(m_listen[supervisor]);
    close_fd(m_fd[supervisor]);
}

void Peers::supervisor_comes(unsigned supervisor) {
    g_state->supervisor_gone[supervisor] = false;
    if (m_listen[supervisor] < 0) {
        m_listen[supervisor] = listen_at(SUPERVISOR_NAMES[supervisor]);
    }
}
