// SPDX-License-Identifier: Apache-2.0

#include "kestlog/Progress.h"

#include <stdio.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>

namespace {

constexpr int64_t FIRST_MS = 1000;
constexpr int64_t INTERVAL_MS = 200;
constexpr char ERASE_LINE[] = "\r\x1b[K";

Progress* current = nullptr;

int64_t now_ms() {
    struct timespec t;
    clock_gettime(CLOCK_MONOTONIC, &t);
    return static_cast<int64_t>(t.tv_sec) * 1000 + t.tv_nsec / 1000000;
}

}  // namespace

Progress::Progress(uint64_t total, bool talkative)
    : m_outer(current),
      m_total(total),
      m_terminal(isatty(STDERR_FILENO) && !(talkative && isatty(STDOUT_FILENO))),
      m_due_ms(now_ms() + FIRST_MS) {
    current = this;
}

Progress::~Progress() {
    clear();
    current = m_outer;
}

void Progress::advance(uint64_t bytes) {
    if (current && current->m_terminal) {
        current->m_done += bytes;
        const int64_t now = now_ms();
        if (now >= current->m_due_ms) {
            current->show(now);
        }
    }
}

void Progress::clear() {
    if (current && current->m_shown) {
        fputs(ERASE_LINE, stderr);
        current->m_shown = false;
    }
}

void Progress::show(int64_t now) {
    const auto mib = [](uint64_t bytes) {
        return static_cast<unsigned long long>(bytes / (1024 * 1024));
    };
    m_due_ms = now + INTERVAL_MS;
    m_shown = true;
    if (m_total > 0) {
        const uint64_t done = std::min(m_done, m_total);
        fprintf(stderr, "%s%3llu %%  %llu of %llu MiB", ERASE_LINE,
                static_cast<unsigned long long>(static_cast<double>(done) * 100 /
                                                static_cast<double>(m_total)),
                mib(done), mib(m_total));
    } else {
        fprintf(stderr, "%s%llu MiB", ERASE_LINE, mib(m_done));
    }
}
