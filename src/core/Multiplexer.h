// SPDX-License-Identifier: Apache-2.0
// The event loop of the service. All input passes through it: it polls the descriptors
// of the registered handlers, runs the timers that are due and calls the handlers that
// are ready. Owned by the LogController for the whole life of the process; handlers are
// not owned. Everything here is called from the one thread that runs the loop.
//
// Handlers may be registered, removed and destroyed at any time, from process() and
// timer callbacks as well. A change takes effect on what is polled at the next pass, but
// a handler that was removed or destroyed is not called any more in the current one.
#ifndef CORE_MULTIPLEXER_H_
#define CORE_MULTIPLEXER_H_

#include <poll.h>
#include <stddef.h>
#include <utils/Vector.h>

#include "core/TimerManager.h"

class FdHandler;

class Multiplexer {
public:
    static constexpr size_t MAX_HANDLERS = 20;
    // Of these, what captures leave to the control socket, three clients and two supervisors.
    static constexpr size_t CONTROL_PLACES = 6;

    Multiplexer() = default;
    Multiplexer(const Multiplexer&) = delete;
    Multiplexer& operator=(const Multiplexer&) = delete;

    // Polls h's descriptor for events (poll bits) from the next pass on, in addition to
    // those it is registered for. 0, or -1 when MAX_HANDLERS others are registered.
    int register_fd(FdHandler* h, int events);

    // As register_fd, but when there is no room (-1) h waits: it is registered as soon as others
    // have left. Handlers that wait are admitted in their order, captures only as long as
    // CONTROL_PLACES are left. For a handler that serves a log the youngest capture waits.
    int register_when_room(FdHandler* h, int events);

    // Drops events of h; a handler without events left is removed. Events that h is not
    // registered for are ignored.
    void unregister_fd(FdHandler* h, int events);

    // Gives the place of from, or its turn for one, to a handler that is to be polled in its
    // stead for the same events; others that wait do not come between. Nothing happens when
    // from has neither.
    void hand_over(FdHandler* from, FdHandler* to);

    // Removes h with all its events, for a handler that is being destroyed.
    void forget(FdHandler* h);

    // h is not called any more in the current pass; the poll set is built afresh.
    void pass_over(const FdHandler* h);

    // A handler's rest or hold has begun or ended: the poll set is built afresh for the next pass.
    void rest_changed() { m_changed = true; }

    // Runs the loop; never returns.
    [[noreturn]] void run();

    // One pass of the loop: waits until a descriptor is ready, a timer is due or a
    // signal arrives, runs the due timers, then calls the ready handlers in the order of
    // their registration. A poll that fails counts as a pass without ready handlers.
    // Must not be called from a handler or a timer callback.
    void run_once();

    TimerManager& timer_mgr() { return m_timer_mgr; }

private:
    struct PollEntry {
        FdHandler* handler;
        int events;
    };

    // Index of h's entry, or the number of entries when it has none.
    static size_t find(const android::Vector<PollEntry>& entries, const FdHandler* h);
    bool has_room(const FdHandler* h) const;
    bool captures_may_grow() const;
    void displace_capture();
    void leave_pass(const FdHandler* h);
    void remove_entry(size_t index);
    void remove_waiting(FdHandler* h, int events);
    void build_poll_set();

    android::Vector<PollEntry> m_entries;
    android::Vector<PollEntry> m_waiting;  // for room in m_entries
    bool m_changed = true;                 // m_entries differs from what the arrays were built from
    size_t m_poll_num = 0;                 // slots in use in both arrays
    struct pollfd m_poll_fds[MAX_HANDLERS];
    FdHandler* m_handlers[MAX_HANDLERS];  // null: removed since the arrays were built
    TimerManager m_timer_mgr;
};

#endif  // CORE_MULTIPLEXER_H_
