// SPDX-License-Identifier: Apache-2.0

#include "sim/WriteClock.h"

#include <fcntl.h>
#include <poll.h>
#include <string.h>
#include <sys/inotify.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>

int64_t WriteClock::now_ns() {
    timespec now;
    clock_gettime(CLOCK_MONOTONIC, &now);
    return now.tv_sec * 1000000000LL + now.tv_nsec;
}

bool WriteClock::start(const std::vector<std::string>& dirs) {
    stop();
    m_watches.clear();
    m_writes.clear();
    m_notify = inotify_init1(IN_NONBLOCK | IN_CLOEXEC);
    if (m_notify < 0) {
        return false;
    }
    for (const std::string& dir : dirs) {
        const int watch = inotify_add_watch(m_notify, dir.c_str(), IN_MODIFY);
        if (watch < 0) {
            stop();
            return false;
        }
        m_watches.push_back(watch);
    }
    if (pipe2(m_wake, O_CLOEXEC) != 0) {
        stop();
        return false;
    }
    m_thread = std::thread(&WriteClock::run, this);
    return true;
}

void WriteClock::stop() {
    if (m_wake[1] >= 0) {
        close(m_wake[1]);
    }
    if (m_thread.joinable()) {
        m_thread.join();
    }
    if (m_wake[0] >= 0) {
        close(m_wake[0]);
    }
    if (m_notify >= 0) {
        close(m_notify);
    }
    m_notify = m_wake[0] = m_wake[1] = -1;
}

void WriteClock::run() {
    pollfd fds[2] = {{m_notify, POLLIN, 0}, {m_wake[0], POLLIN, 0}};
    for (;;) {
        if (poll(fds, 2, -1) < 0) {
            continue;
        }
        const int64_t now = now_ns();
        alignas(inotify_event) char buf[16384];
        const ssize_t n = (fds[0].revents & POLLIN) != 0 ? read(m_notify, buf, sizeof buf) : 0;
        for (ssize_t at = 0; at < n;) {
            const auto* event = reinterpret_cast<const inotify_event*>(buf + at);
            if (event->len > 0 && strncmp(event->name, "0-", 2) == 0) {
                m_writes.emplace_back(event->wd, now);
            }
            at += static_cast<ssize_t>(sizeof *event + event->len);
        }
        if (fds[1].revents != 0) {
            return;
        }
    }
}

WriteClock::Gap WriteClock::gap(int64_t from_ns, int64_t to_ns) const {
    Gap result;
    int64_t largest = 0;
    for (int watch : m_watches) {
        unsigned writes = 0;
        int64_t last = from_ns;
        for (const auto& write : m_writes) {
            if (write.first == watch && write.second >= from_ns && write.second <= to_ns) {
                largest = std::max(largest, write.second - last);
                last = write.second;
                ++writes;
            }
        }
        largest = std::max(largest, to_ns - last);
        result.writes = watch == m_watches[0] ? writes : std::min(result.writes, writes);
    }
    result.largest_ms = static_cast<double>(largest) / 1e6;
    return result;
}
