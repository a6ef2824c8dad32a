// A time-out of an exchange with a CP: calls back once a period has passed since the
// exchange last got what it waits for. A member of the exchange's consumer, which it does
// not outlive; a pending timer goes with it.
#ifndef CHANNELS_EXCHANGETIMER_H_
#define CHANNELS_EXCHANGETIMER_H_

#include "core/TimerManager.h"

class ExchangeTimer {
public:
    ExchangeTimer(unsigned int period_ms, TimerManager::timer_callback callback, void* consumer)
        : m_period_ms(period_ms), m_callback(callback), m_consumer(consumer) {}
    ~ExchangeTimer() { stop(); }
    ExchangeTimer(const ExchangeTimer&) = delete;
    ExchangeTimer& operator=(const ExchangeTimer&) = delete;

    // Begins a period. 0, or -1 when the clock cannot be read: the exchange must end at
    // once then, because nothing else would end it.
    int start(TimerManager& timers);
    // Begins the period of a pending timer anew. Without a clock the old one goes on.
    void restart();
    void stop();
    // The timer has called back. The callback says so before anything else.
    void fired() { m_timer = nullptr; }
    bool pending() const { return m_timer != nullptr; }

private:
    unsigned int m_period_ms;
    TimerManager::timer_callback m_callback;
    void* m_consumer;
    TimerManager* m_timers = nullptr;
    TimerManager::Timer* m_timer = nullptr;
};

#endif  // CHANNELS_EXCHANGETIMER_H_
