// SPDX-License-Identifier: Apache-2.0

#include "sim/SimControlClient.h"

#include <errno.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <chrono>

#include "sim/local_socket.h"

namespace {

using Clock = std::chrono::steady_clock;

const char NOTIFICATION[] = "CP_DUMP_";

int ms_until(Clock::time_point deadline) {
    return static_cast<int>(
        std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now()).count());
}

}  // namespace

bool SimControlClient::connect(const std::string& root, int timeout_ms) {
    disconnect();
    const auto deadline = Clock::now() + std::chrono::milliseconds(timeout_ms);
    while ((m_fd = connect_local("kestmodem", root)) < 0) {
        const int error = errno;
        if (ms_until(deadline) <= 0) {
            errno = error;
            return false;
        }
        usleep(5000);
    }
    return true;
}

void SimControlClient::disconnect() {
    if (m_fd >= 0) {
        close(m_fd);
        m_fd = -1;
    }
    m_rest.clear();
    m_replies.clear();
    m_notifications.clear();
}

bool SimControlClient::send_raw(const std::string& bytes) {
    return m_fd >= 0 && ::send(m_fd, bytes.data(), bytes.size(), MSG_NOSIGNAL) ==
                            static_cast<ssize_t>(bytes.size());
}

void SimControlClient::poll() {
    char buf[1024];
    while (m_fd >= 0) {
        const ssize_t n = recv(m_fd, buf, sizeof buf, MSG_DONTWAIT);
        if (n > 0) {
            m_rest.append(buf, static_cast<size_t>(n));
        } else if (n < 0 && errno == EINTR) {
            continue;
        } else {
            if (n == 0 || errno != EAGAIN) {
                close(m_fd);
                m_fd = -1;
            }
            break;
        }
    }
    for (size_t end; (end = m_rest.find('\n')) != std::string::npos; m_rest.erase(0, end + 1)) {
        const std::string line = m_rest.substr(0, end);
        const bool notified = line.compare(0, sizeof NOTIFICATION - 1, NOTIFICATION) == 0;
        (notified ? m_notifications : m_replies).push_back(line);
    }
}

bool SimControlClient::take(std::deque<std::string>& lines, std::string* line, int timeout_ms) {
    const auto deadline = Clock::now() + std::chrono::milliseconds(timeout_ms);
    for (;;) {
        poll();
        if (!lines.empty()) {
            *line = lines.front();
            lines.pop_front();
            return true;
        }
        const int left = ms_until(deadline);
        if (m_fd < 0 || left <= 0) {
            return false;
        }
        pollfd p = {m_fd, POLLIN, 0};
        ::poll(&p, 1, left);
    }
}

bool SimControlClient::reply(std::string* line, int timeout_ms) {
    return take(m_replies, line, timeout_ms);
}

bool SimControlClient::notification(std::string* line, int timeout_ms) {
    return take(m_notifications, line, timeout_ms);
}

std::string SimControlClient::request(const std::string& line, int timeout_ms) {
    std::string answer;
    return send(line) && reply(&answer, timeout_ms) ? answer : "";
}
