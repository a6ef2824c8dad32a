// SPDX-License-Identifier: Apache-2.0

#include "core/TimerManager.h"

#include <limits.h>

#include "core/list_find.h"
#include "core/log.h"

namespace {

const long NS_PER_MS = 1000000;
const long NS_PER_S = 1000000000;

}  // namespace

TimerManager::~TimerManager() {
    for (auto it = m_timers.begin(); it != m_timers.end(); ++it) {
        delete *it;
    }
}

bool TimerManager::read_clock(struct timespec& now) {
    return clock_gettime(CLOCK_BOOTTIME, &now) == 0;
}

struct timespec TimerManager::add_ms(const struct timespec& t, unsigned int ms) {
    const int period = static_cast<int>(ms);
    struct timespec sum;
    sum.tv_sec = t.tv_sec + period / 1000;
    sum.tv_nsec = t.tv_nsec + period % 1000 * NS_PER_MS;
    if (sum.tv_nsec >= NS_PER_S) {
        ++sum.tv_sec;
        sum.tv_nsec -= NS_PER_S;
    }
    return sum;
}

int64_t TimerManager::diff_ms(const struct timespec& a, const struct timespec& b) {
    // Before the subtraction: both are of 32 bits on a 32-bit handset.
    const int64_t seconds = static_cast<int64_t>(a.tv_sec) - b.tv_sec;
    return (a.tv_nsec - b.tv_nsec) / NS_PER_MS + 1000 * seconds;
}

bool TimerManager::is_earlier(const struct timespec& a, const struct timespec& b) {
    return a.tv_sec != b.tv_sec ? a.tv_sec < b.tv_sec : a.tv_nsec < b.tv_nsec;
}

int TimerManager::add_timer(unsigned int ms, timer_callback cb, void* client_data) {
    if (!create_timer(ms, cb, client_data)) {
        err_log("clock_gettime CLOCK_BOOTTIME error");
        return -1;
    }
    return 0;
}

TimerManager::Timer* TimerManager::create_timer(unsigned int ms, timer_callback cb,
                                                void* client_data) {
    struct timespec now;
    if (!read_clock(now)) {
        return nullptr;
    }
    Timer* const t = new Timer{add_ms(now, ms), cb, client_data, m_pass};
    auto it = m_timers.begin();
    while (it != m_timers.end() && !is_earlier(t->due, (*it)->due)) {
        ++it;
    }
    m_timers.insert(it, t);
    return t;
}

int TimerManager::set_new_due_time(Timer* t, unsigned int ms) {
    struct timespec now;
    auto it = find_object(m_timers, t);
    if (it == m_timers.end() || !read_clock(now)) {
        return -1;
    }
    t->due = add_ms(now, ms);
    // Moves the timer to its new place by shifting those in between, without touching
    // the list's nodes: a running transaction re-arms its time-out with every read.
    for (auto next = it; ++next != m_timers.end() && !is_earlier(t->due, (*next)->due); ++it) {
        *it = *next;
        *next = t;
    }
    while (it != m_timers.begin()) {
        auto prev = it;
        --prev;
        if (!is_earlier(t->due, (*prev)->due)) {
            break;
        }
        *it = *prev;
        *prev = t;
        it = prev;
    }
    return 0;
}

void TimerManager::del_timer(Timer* t) {
    auto it = find_object(m_timers, t);
    if (it != m_timers.end()) {
        m_timers.erase(it);
        delete t;
    }
}

void TimerManager::cancel_timers(timer_callback cb, void* client_data) {
    for (auto it = m_timers.begin(); it != m_timers.end();) {
        Timer* const t = *it;
        if (t->cb == cb && t->client_data == client_data) {
            it = m_timers.erase(it);
            delete t;
        } else {
            ++it;
        }
    }
}

int TimerManager::get_timeout(int* ms) {
    if (m_timers.empty()) {
        *ms = -1;
        return 0;
    }
    struct timespec now;
    if (!read_clock(now)) {
        return -1;
    }
    const struct timespec& due = (*m_timers.begin())->due;
    const int64_t left = is_earlier(now, due) ? diff_ms(due, now) : 0;
    *ms = left > INT_MAX ? INT_MAX : static_cast<int>(left);
    return 0;
}

void TimerManager::process_timers() {
    struct timespec now;
    if (m_timers.empty() || !read_clock(now)) {
        return;
    }
    const uint64_t pass = ++m_pass;
    // Starts from the earliest timer after each callback, which may have changed any part
    // of the list. Timers added by callbacks are skipped, so that the pass ends even if
    // the clock has stood still since.
    auto it = m_timers.begin();
    while (it != m_timers.end() && !is_earlier(now, (*it)->due)) {
        Timer* const t = *it;
        if (t->pass >= pass) {
            ++it;
            continue;
        }
        m_timers.erase(it);
        t->cb(t->client_data);
        delete t;
        it = m_timers.begin();
    }
}
