// SPDX-License-Identifier: Apache-2.0

#include "core/OneShotTimer.h"

int OneShotTimer::start(unsigned int ms) {
    if (m_timer) {
        return m_timers->set_new_due_time(m_timer, ms);
    }
    if (!m_timers) {
        return -1;
    }
    stop();
    m_timer = m_timers->create_timer(ms, on_due, this);
    return m_timer ? 0 : -1;
}

int OneShotTimer::start_or_log(unsigned int ms) {
    stop();
    m_added = m_timers->add_timer(ms, on_due, this) == 0;
    return m_added ? 0 : -1;
}

void OneShotTimer::stop() {
    if (m_timer) {
        m_timers->del_timer(m_timer);
        m_timer = nullptr;
    }
    if (m_added) {
        m_timers->cancel_timers(on_due, this);
        m_added = false;
    }
}

void OneShotTimer::on_due(void* timer) {
    OneShotTimer* const self = static_cast<OneShotTimer*>(timer);
    self->m_timer = nullptr;
    self->m_added = false;
    self->m_callback(self->m_client);  // which may destroy this
}
