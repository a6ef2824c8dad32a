// SPDX-License-Identifier: Apache-2.0
// One-shot timers in order of expiry, on the clock that keeps counting while the handset
// sleeps. A member of the Multiplexer, which sleeps until the earliest timer and then has
// the due ones run. Owns the timers: one that has fired or was cancelled is deleted, and
// its handle must not be used any more. Loop thread only.
//
// A callback may add timers, and cancel or re-arm any timer. Its own timer is no longer
// pending then: cancelling it does nothing, re-arming it fails.
#ifndef CORE_TIMERMANAGER_H_
#define CORE_TIMERMANAGER_H_

#include <stdint.h>
#include <time.h>
#include <utils/List.h>

class TimerManager {
public:
    typedef void (*timer_callback)(void* client_data);

    // A pending timer. Others use it only as a handle.
    struct Timer {
        struct timespec due;
        timer_callback cb;
        void* client_data;
        uint64_t pass;  // number of the last pass begun before the timer was added
    };

    TimerManager() = default;
    // Deletes the pending timers without calling them.
    ~TimerManager();
    TimerManager(const TimerManager&) = delete;
    TimerManager& operator=(const TimerManager&) = delete;

    // Calls cb(client_data) once, ms milliseconds from now. Timers due at the same time
    // fire in the order they were added. 0, or -1 (logged) when the clock cannot be read.
    // Whoever may go before the timer fires takes it back with cancel_timers.
    int add_timer(unsigned int ms, timer_callback cb, void* client_data);

    // Cancels every pending timer with that callback and that client.
    void cancel_timers(timer_callback cb, void* client_data);

    // As add_timer, for a caller that wants to cancel or re-arm the timer. The handle is
    // valid until the timer fires or is cancelled. Null, not logged, without a clock.
    Timer* create_timer(unsigned int ms, timer_callback cb, void* client_data);

    // Makes a pending timer due ms milliseconds from now. -1 when t is not pending or the
    // clock cannot be read; the timer is unchanged then.
    int set_new_due_time(Timer* t, unsigned int ms);

    // Cancels a timer; nothing happens when t is not pending.
    void del_timer(Timer* t);

    // Stores the time-out for poll: whole milliseconds to the earliest timer (INT_MAX when
    // it is further away), 0 when it is overdue, -1 without timers. Returns 0, or -1 when the clock
    // cannot be read.
    int get_timeout(int* ms);

    // Runs the timers that are due now, earliest first. Those added meanwhile wait for
    // the next pass, even with 0 ms.
    void process_timers();

    // The time on the clock of the timers. False, not logged, when it cannot be read.
    static bool read_clock(struct timespec& now);

    // Time arithmetic on normalised values: t plus ms milliseconds; a minus b in
    // milliseconds, the difference of the nanoseconds cut towards zero; a before b.
    static struct timespec add_ms(const struct timespec& t, unsigned int ms);
    static int64_t diff_ms(const struct timespec& a, const struct timespec& b);
    static bool is_earlier(const struct timespec& a, const struct timespec& b);

private:
    android::List<Timer*> m_timers;  // by due time, earliest first
    uint64_t m_pass = 0;             // passes begun
};

#endif  // CORE_TIMERMANAGER_H_
