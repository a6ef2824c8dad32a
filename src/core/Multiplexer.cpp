// SPDX-License-Identifier: Apache-2.0

#include "core/Multiplexer.h"

#include <errno.h>

#include "core/FdHandler.h"
#include "core/log.h"
#include "core/poll_error.h"

size_t Multiplexer::find(const android::Vector<PollEntry>& entries, const FdHandler* h) {
    size_t i = 0;
    while (i < entries.size() && entries[i].handler != h) {
        ++i;
    }
    return i;
}

int Multiplexer::register_fd(FdHandler* h, int events) {
    const size_t i = find(m_entries, h);
    if (i < m_entries.size()) {
        if ((m_entries[i].events & events) == events) {
            return 0;
        }
        m_entries.editItemAt(i).events |= events;
    } else {
        if (m_entries.size() >= MAX_HANDLERS) {
            return -1;
        }
        PollEntry entry;
        entry.handler = h;
        entry.events = events;
        m_entries.push(entry);
    }
    m_changed = true;
    return 0;
}

// Without those that serve control, whose places are kept.
bool Multiplexer::captures_may_grow() const {
    size_t others = 0;
    for (size_t i = 0; i < m_entries.size(); ++i) {
        others += m_entries[i].handler->service() != FdHandler::SERVES_CONTROL;
    }
    return others < MAX_HANDLERS - CONTROL_PLACES;
}

bool Multiplexer::has_room(const FdHandler* h) const {
    return m_entries.size() < MAX_HANDLERS &&
           (h->service() != FdHandler::SERVES_CAPTURE || captures_may_grow());
}

void Multiplexer::displace_capture() {
    for (size_t i = m_entries.size(); i-- > 0;) {
        const PollEntry entry = m_entries[i];
        if (entry.handler->service() == FdHandler::SERVES_CAPTURE) {
            info_log("a capture waits for room to be polled");
            leave_pass(entry.handler);
            m_entries.removeAt(i);
            m_waiting.insertAt(entry, 0);
            m_changed = true;
            return;
        }
    }
}

int Multiplexer::register_when_room(FdHandler* h, int events) {
    const bool registered = find(m_entries, h) < m_entries.size();
    if (!registered && h->service() == FdHandler::SERVES_LOG && !captures_may_grow()) {
        displace_capture();
    }
    if (registered || has_room(h)) {
        return register_fd(h, events);
    }
    const size_t i = find(m_waiting, h);
    if (i < m_waiting.size()) {
        m_waiting.editItemAt(i).events |= events;
    } else {
        PollEntry entry;
        entry.handler = h;
        entry.events = events;
        m_waiting.push(entry);
    }
    return -1;
}

void Multiplexer::unregister_fd(FdHandler* h, int events) {
    remove_waiting(h, events);
    const size_t i = find(m_entries, h);
    if (i == m_entries.size() || !(m_entries[i].events & events)) {
        return;
    }
    PollEntry& entry = m_entries.editItemAt(i);
    entry.events &= ~events;
    m_changed = true;
    if (!entry.events) {
        remove_entry(i);
    }
}

void Multiplexer::forget(FdHandler* h) {
    remove_waiting(h, ~0);
    const size_t i = find(m_entries, h);
    if (i < m_entries.size()) {
        remove_entry(i);
    }
}

void Multiplexer::hand_over(FdHandler* from, FdHandler* to) {
    const size_t i = find(m_entries, from);
    if (i < m_entries.size()) {
        leave_pass(from);
        m_entries.editItemAt(i).handler = to;
        m_changed = true;
        return;
    }
    const size_t waiting = find(m_waiting, from);
    if (waiting < m_waiting.size()) {
        m_waiting.editItemAt(waiting).handler = to;
    }
}

void Multiplexer::remove_waiting(FdHandler* h, int events) {
    const size_t i = find(m_waiting, h);
    if (i < m_waiting.size()) {
        PollEntry& entry = m_waiting.editItemAt(i);
        entry.events &= ~events;
        if (!entry.events) {
            m_waiting.removeAt(i);
        }
    }
}

// The current pass may still have to visit the handler's slot.
void Multiplexer::leave_pass(const FdHandler* h) {
    for (size_t i = 0; i < m_poll_num; ++i) {
        if (m_handlers[i] == h) {
            m_handlers[i] = nullptr;
        }
    }
}

void Multiplexer::pass_over(const FdHandler* h) {
    leave_pass(h);
    m_changed = true;
}

void Multiplexer::remove_entry(size_t index) {
    leave_pass(m_entries[index].handler);
    m_entries.removeAt(index);
    for (size_t i = 0; i < m_waiting.size(); ++i) {
        if (has_room(m_waiting[i].handler)) {
            m_entries.push(m_waiting[i]);
            m_waiting.removeAt(i);
            break;
        }
    }
    m_changed = true;
}

void Multiplexer::build_poll_set() {
    m_poll_num = m_entries.size();
    for (size_t i = 0; i < m_poll_num; ++i) {
        const FdHandler* handler = m_entries[i].handler;
        const bool passed_over = handler->resting() || handler->held();
        m_poll_fds[i].fd = passed_over ? -1 : handler->fd();  // poll passes over -1
        m_poll_fds[i].events = static_cast<short>(m_entries[i].events);
        m_poll_fds[i].revents = 0;
        m_handlers[i] = m_entries[i].handler;
    }
    m_changed = false;
}

void Multiplexer::run() {
    for (;;) {
        run_once();
    }
}

void Multiplexer::run_once() {
    if (m_changed) {
        build_poll_set();
    }
    int timeout;
    if (m_timer_mgr.get_timeout(&timeout) < 0) {
        timeout = -1;
    }
    const int ready = poll(m_poll_fds, static_cast<nfds_t>(m_poll_num), timeout);
    const int error = errno;
    m_timer_mgr.process_timers();
    if (ready < 0) {
        wait_after_failed_poll(error);
    }
    if (ready <= 0) {
        return;
    }
    // The arrays stay as they are until the next pass, except for the slots that
    // remove_entry() clears.
    for (size_t i = 0; i < m_poll_num; ++i) {
        if (m_poll_fds[i].revents && m_handlers[i]) {
            m_handlers[i]->process(m_poll_fds[i].revents);
        }
    }
}
