// SPDX-License-Identifier: Apache-2.0

#include "core/Multiplexer.h"

#include <errno.h>

#include "core/FdHandler.h"
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

int Multiplexer::register_when_room(FdHandler* h, int events) {
    if (register_fd(h, events) == 0) {
        return 0;
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

void Multiplexer::remove_entry(size_t index) {
    leave_pass(m_entries[index].handler);
    m_entries.removeAt(index);
    if (!m_waiting.isEmpty()) {
        m_entries.push(m_waiting[0]);
        m_waiting.removeAt(0);
    }
    m_changed = true;
}

void Multiplexer::build_poll_set() {
    m_poll_num = m_entries.size();
    for (size_t i = 0; i < m_poll_num; ++i) {
        const FdHandler* handler = m_entries[i].handler;
        m_poll_fds[i].fd = handler->resting() ? -1 : handler->fd();  // poll passes over -1
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
