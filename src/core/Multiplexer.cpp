#include "core/Multiplexer.h"

#include "core/FdHandler.h"

size_t Multiplexer::find(const FdHandler* h) const {
    size_t i = 0;
    while (i < m_entries.size() && m_entries[i].handler != h) {
        ++i;
    }
    return i;
}

int Multiplexer::register_fd(FdHandler* h, int events) {
    const size_t i = find(h);
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

void Multiplexer::unregister_fd(FdHandler* h, int events) {
    const size_t i = find(h);
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
    const size_t i = find(h);
    if (i < m_entries.size()) {
        remove_entry(i);
    }
}

void Multiplexer::remove_entry(size_t index) {
    // The current pass may still have to visit the handler's slot.
    for (size_t i = 0; i < m_poll_num; ++i) {
        if (m_handlers[i] == m_entries[index].handler) {
            m_handlers[i] = nullptr;
        }
    }
    m_entries.removeAt(index);
    m_changed = true;
}

void Multiplexer::build_poll_set() {
    m_poll_num = m_entries.size();
    for (size_t i = 0; i < m_poll_num; ++i) {
        m_poll_fds[i].fd = m_entries[i].handler->fd();
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
    m_timer_mgr.process_timers();
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
