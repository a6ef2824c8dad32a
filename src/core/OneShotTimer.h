// SPDX-License-Identifier: Apache-2.0
// A timer that its owner can start, start again and stop any number of times; it calls back
// once for each start that is not taken back. A member of its owner, which it does not
// outlive: a pending timer is stopped with it. In the callback the timer is no longer
// pending, so the callback may start it again, or destroy its owner. Loop thread only.
#ifndef CORE_ONESHOTTIMER_H_
#define CORE_ONESHOTTIMER_H_

#include "core/TimerManager.h"

class OneShotTimer {
public:
    // Calls callback(client). timers, not owned, may be null until bind().
    OneShotTimer(TimerManager* timers, TimerManager::timer_callback callback, void* client)
        : m_timers(timers), m_callback(callback), m_client(client) {}
    ~OneShotTimer() { stop(); }
    OneShotTimer(const OneShotTimer&) = delete;
    OneShotTimer& operator=(const OneShotTimer&) = delete;

    void bind(TimerManager& timers) { m_timers = &timers; }

    // Due ms milliseconds from now, pending already or not. 0, or -1 when the clock cannot be
    // read or nothing is bound: a pending timer keeps its time then.
    int start(unsigned int ms);
    // The same for a timer that nobody watches: the failure is logged, by TimerManager, and a timer
    // that was pending is not any more.
    int start_or_log(unsigned int ms);
    void stop();
    bool pending() const { return m_timer || m_added; }

private:
    static void on_due(void* timer);

    TimerManager* m_timers;
    const TimerManager::timer_callback m_callback;
    void* const m_client;
    TimerManager::Timer* m_timer = nullptr;
    bool m_added = false;  // pending without a handle: made by add_timer, for its message
};

#endif  // CORE_ONESHOTTIMER_H_
