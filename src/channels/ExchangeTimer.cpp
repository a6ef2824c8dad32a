#include "channels/ExchangeTimer.h"

int ExchangeTimer::start(TimerManager& timers) {
    stop();
    m_timers = &timers;
    m_timer = timers.create_timer(m_period_ms, m_callback, m_consumer);
    return m_timer ? 0 : -1;
}

void ExchangeTimer::restart() {
    if (m_timer) {
        m_timers->set_new_due_time(m_timer, m_period_ms);
    }
}

void ExchangeTimer::stop() {
    if (m_timer) {
        m_timers->del_timer(m_timer);
        m_timer = nullptr;
    }
}
