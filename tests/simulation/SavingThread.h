// SPDX-License-Identifier: Apache-2.0
// The service's second thread, which saves I/Q buffers, led step by step: of it and the loop
// only one runs at a time. The thread stops in front of each of its calls until the plan lets it
// go on; that can be in front of any call of the loop, or while the loop waits. So every order
// of the two threads' calls can happen, and happens again with the same seed. Belongs to one
// life of the service.
#ifndef SIMULATION_SAVINGTHREAD_H_
#define SIMULATION_SAVINGTHREAD_H_

#include <pthread.h>
#include <semaphore.h>
#include <stdint.h>

#include "simulation/Chance.h"

class SavingThread {
public:
    SavingThread();
    // In place of pthread_create and pthread_join.
    int create(pthread_t* id, void* (*routine)(void*), void* param);
    int join(pthread_t id);

    // Whether the caller is that thread.
    static bool here();

    // On the thread: waits in front of its next call. It goes on not before so long.
    void stop_before_call(int64_t pause_ns = 0);
    // On the thread: there is nothing to do until wake().
    void rest();

    // On the loop: something came for the thread.
    void wake();
    // On the loop: the thread may make its next call. It does when its time has come and, while
    // the loop does not wait, by chance.
    void lead(bool loop_waits);
    // When it goes on by itself: INT64_MAX while it rests.
    int64_t next_due() const;
    // How its steps are mixed with the loop's from now on.
    void set_pace(uint64_t seed);

private:
    static void* run(void* thread);
    void hand_over(bool to_thread);

    sem_t m_turns[2];  // of the loop, of the thread
    // These are touched by the one whose turn it is.
    bool m_exists = false;
    bool m_rests = false;
    int64_t m_due = 0;
    Chance m_chance{0};
    uint64_t m_one_in = 1;  // so many calls of the loop it goes on
    uint64_t m_slowness = 0;
    void* (*m_routine)(void*) = nullptr;
    void* m_param = nullptr;
};

#endif  // SIMULATION_SAVINGTHREAD_H_
