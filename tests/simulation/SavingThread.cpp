// SPDX-License-Identifier: Apache-2.0

#include "simulation/SavingThread.h"

#include <algorithm>

#include "simulation/Calls.h"

extern "C" int __real_pthread_create(pthread_t* id, const pthread_attr_t* attributes,
                                     void* (*routine)(void*), void* param);
extern "C" int __real_pthread_join(pthread_t id, void** result);

namespace {

thread_local bool s_here = false;

}  // namespace

bool SavingThread::here() {
    return s_here;
}

SavingThread::SavingThread() {
    sem_init(&m_turns[false], 0, 0);
    sem_init(&m_turns[true], 0, 0);
}

int SavingThread::create(pthread_t* id, void* (*routine)(void*), void* param) {
    if (m_exists) {
        fail_run("thread", "a second saving thread");
    }
    m_routine = routine;
    m_param = param;
    m_exists = true;
    m_rests = false;
    m_due = g_state->boot_ns;
    return __real_pthread_create(id, nullptr, run, this);
}

int SavingThread::join(pthread_t id) {
    while (m_exists) {
        if (m_rests) {
            fail_run("hang", "the loop waits for a thread that waits for it");
        }
        g_state->boot_ns = std::max(g_state->boot_ns, m_due);
        lead(true);
    }
    return __real_pthread_join(id, nullptr);
}

void* SavingThread::run(void* param) {
    SavingThread* const self = static_cast<SavingThread*>(param);
    s_here = true;
    sem_wait(&self->m_turns[true]);
    g_inside = true;
    void* const result = self->m_routine(self->m_param);
    g_inside = false;
    self->m_exists = false;
    sem_post(&self->m_turns[false]);
    return result;
}

void SavingThread::hand_over(bool to_thread) {
    sem_post(&m_turns[to_thread]);
    while (sem_wait(&m_turns[!to_thread]) != 0) {  // a signal
    }
}

void SavingThread::stop_before_call(int64_t pause_ns) {
    constexpr uint64_t PAUSES_NS[] = {1, 1000000, 1000000000, 20000000000};
    if (m_slowness != 0 && m_chance.one_in(2)) {
        pause_ns += static_cast<int64_t>(m_chance.below(PAUSES_NS[m_slowness]));
    }
    m_due = g_state->boot_ns + pause_ns;
    hand_over(false);
}

void SavingThread::rest() {
    m_rests = true;
    hand_over(false);
}

void SavingThread::wake() {
    m_rests = false;
    m_due = std::max(m_due, g_state->boot_ns);
}

void SavingThread::lead(bool loop_waits) {
    if (g_state->boot_ns >= next_due() && (loop_waits || m_chance.one_in(m_one_in))) {
        hand_over(true);
    }
}

int64_t SavingThread::next_due() const {
    return m_exists && !m_rests ? m_due : INT64_MAX;
}

void SavingThread::set_pace(uint64_t seed) {
    static const uint64_t STEPS[] = {1, 2, 5, 50, 100000};
    m_chance = Chance(seed);
    m_one_in = m_chance.pick(STEPS);
    m_slowness = m_chance.below(4);
}
