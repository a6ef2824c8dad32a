// SPDX-License-Identifier: Apache-2.0

#include "core/TimerManager.h"

#include "support/TestRoot.h"
#include "support/faults.h"

namespace {

// Timers on a clock that the test moves; each timer logs its name when it fires.
class TimerManagerTest : public testing::Test {
protected:
    struct Client {
        std::string* fired;
        char name;
        std::function<void()> action;
        TimerManager::Timer* timer;
    };

    TimerManagerTest() { boot_clock::freeze(); }
    ~TimerManagerTest() override { boot_clock::real(); }

    static void fire(void* data) {
        Client* const client = static_cast<Client*>(data);
        *client->fired += client->name;
        if (client->action) {
            client->action();
        }
    }
    // Creates the timer "a", "b", ... for client 0, 1, ...
    void create(size_t i, unsigned int ms) {
        m_clients[i].fired = &m_fired;
        m_clients[i].name = static_cast<char>('a' + i);
        m_clients[i].timer = m_mgr.create_timer(ms, fire, &m_clients[i]);
        EXPECT_NE(m_clients[i].timer, nullptr);
    }
    // Moves the clock and runs one pass; the names of the timers that fired, in order.
    std::string after(unsigned int ms) {
        boot_clock::advance(ms);
        m_fired.clear();
        m_mgr.process_timers();
        return m_fired;
    }

    Client m_clients[8];
    std::string m_fired;
    TimerManager m_mgr;
};

}  // namespace

// Of timers after 10, 20, 20 and 40 ms one is changed.
TEST_F(TimerManagerTest, CancelAndRearm) {
    const unsigned int periods[] = {10, 20, 20, 40};
    enum Change { CANCEL, REARM };
    const struct {
        size_t timer;
        Change change;
        unsigned int new_period;
        const char* fired;
    } cases[] = {
        {0, CANCEL, 0, "bcd"},  {3, CANCEL, 0, "abc"},   {0, REARM, 40, "bcda"},
        {1, REARM, 20, "acbd"}, {2, REARM, 100, "abdc"}, {2, REARM, 0, "cabd"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.fired);
        for (size_t i = 0; i < 4; ++i) {
            create(i, periods[i]);
        }
        TimerManager::Timer* const t = m_clients[c.timer].timer;
        if (c.change == CANCEL) {
            m_mgr.del_timer(t);
            m_mgr.del_timer(t);  // not pending any more
            EXPECT_EQ(m_mgr.set_new_due_time(t, 10), -1);
        } else {
            EXPECT_EQ(m_mgr.set_new_due_time(t, c.new_period), 0);
        }
        EXPECT_EQ(after(200), c.fired);
    }
    // Those without a handle, of one client.
    for (size_t i : {0u, 1u, 0u}) {
        create(i, 10);
    }
    m_mgr.cancel_timers(fire, &m_clients[0]);
    m_mgr.cancel_timers([](void*) {}, &m_clients[1]);
    EXPECT_EQ(after(10), "b");
}

// The timer that would run next is cancelled or re-armed by a callback.
TEST_F(TimerManagerTest, CallbackMayChangeAnyTimer) {
    for (size_t i = 0; i < 6; ++i) {
        create(i, 10);
    }
    m_clients[0].action = [&] {
        m_mgr.del_timer(m_clients[1].timer);
        EXPECT_EQ(m_mgr.set_new_due_time(m_clients[2].timer, 10), 0);
        // Its own timer is not pending.
        m_mgr.del_timer(m_clients[0].timer);
        EXPECT_EQ(m_mgr.set_new_due_time(m_clients[0].timer, 0), -1);
    };
    m_clients[3].action = [&] {
        m_mgr.del_timer(m_clients[5].timer);
        EXPECT_EQ(m_mgr.set_new_due_time(m_clients[4].timer, 0), 0);
        create(6, 0);  // waits for the next pass
    };
    EXPECT_EQ(after(10), "ade");
    EXPECT_EQ(after(0), "g");
    EXPECT_EQ(after(10), "c");
}

TEST_F(TimerManagerTest, UnreadableClockChangesNothing) {
    int ms = 7;
    EXPECT_TRUE(m_mgr.get_timeout(&ms) == 0 && ms == -1);
    create(1, 60);
    create(0, 10);
    EXPECT_TRUE(m_mgr.get_timeout(&ms) == 0 && ms == 10);
    m_mgr.del_timer(m_clients[1].timer);
    // The farthest a poll may wait; it was negative, which is for ever.
    m_clients[0].timer->due.tv_sec += 3000000;
    EXPECT_TRUE(m_mgr.get_timeout(&ms) == 0 && ms == 2147483647);
    m_clients[0].timer->due.tv_sec -= 3000000;
    ms = 10;
    LogCapture log;
    boot_clock::fail();
    EXPECT_EQ(m_mgr.create_timer(0, fire, nullptr), nullptr);
    EXPECT_EQ(m_mgr.set_new_due_time(m_clients[0].timer, 100), -1);
    EXPECT_EQ(m_mgr.get_timeout(&ms), -1);
    EXPECT_EQ(ms, 10);
    EXPECT_EQ(after(10), "");
    EXPECT_EQ(log.text(), "");
    EXPECT_EQ(m_mgr.add_timer(0, fire, nullptr), -1);
    EXPECT_TRUE(log.has("TimerManager::add_timer(unsigned int, "));
    EXPECT_TRUE(log.has("): clock_gettime CLOCK_BOOTTIME error [22(Invalid argument)]\n"));
    boot_clock::freeze();
    EXPECT_EQ(after(0), "a");
    EXPECT_EQ(m_mgr.add_timer(0, fire, &m_clients[0]), 0);
    EXPECT_EQ(after(0), "a");
}
