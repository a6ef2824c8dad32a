#include "core/Multiplexer.h"

#include <errno.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "core/FdHandler.h"
#include "support/TestRoot.h"
#include "support/boot_clock.h"

namespace {

// What the loop handed to the last poll, and an error to give instead of polling.
std::vector<struct pollfd> g_polled;
int g_timeout;
int g_poll_error;

}  // namespace

extern "C" int __real_poll(struct pollfd* fds, nfds_t num, int timeout);
extern "C" int __wrap_poll(struct pollfd* fds, nfds_t num, int timeout);
extern "C" int __wrap_poll(struct pollfd* fds, nfds_t num, int timeout) {
    g_polled.assign(fds, fds + num);
    g_timeout = timeout;
    if (g_poll_error) {
        errno = g_poll_error;
        return -1;
    }
    return __real_poll(fds, num, timeout);
}

namespace {

// A handler on one end of a socket pair; records its calls and runs an action in them.
class Probe : public FdHandler {
public:
    Probe(Multiplexer* mux, int events) : FdHandler(-1, nullptr, mux) {
        open();
        if (events) {
            EXPECT_EQ(0, add_events(events));
        }
    }
    ~Probe() override { ::close(m_peer); }

    void open() {
        int fds[2];
        ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, fds));
        m_fd = fds[0];
        m_peer = fds[1];
    }
    void reopen() {
        close();
        hang_up();
        open();
    }
    void make_ready() const { ASSERT_EQ(1, write(m_peer, "x", 1)); }
    void hang_up() {
        ::close(m_peer);
        m_peer = -1;
    }

    void process(int events) override {
        calls.push_back(events);
        const std::function<void()> run = action;  // which may destroy this
        if (run) {
            run();
        }
    }

    std::vector<int> calls;
    std::function<void()> action;

private:
    int m_peer = -1;
};

class MultiplexerTest : public testing::Test {
protected:
    ~MultiplexerTest() override {
        g_poll_error = 0;
        boot_clock::real();
    }
    // A pass that does not wait, whatever is ready.
    void pass() {
        mux.timer_mgr().add_timer(
            0, [](void*) {}, nullptr);
        mux.run_once();
    }
    std::unique_ptr<Probe> ready_probe() {
        std::unique_ptr<Probe> probe(new Probe(&mux, POLLIN));
        probe->make_ready();
        return probe;
    }
    Multiplexer mux;
};

const std::vector<int> ONE_INPUT(1, POLLIN);

}  // namespace

TEST_F(MultiplexerTest, ErrorEventsAreDispatched) {
    Probe hung(&mux, POLLIN);
    hung.hang_up();
    Probe invalid(&mux, POLLIN);
    ::close(invalid.fd());
    mux.run_once();
    EXPECT_EQ(std::vector<int>(1, POLLIN | POLLHUP), hung.calls);
    EXPECT_EQ(std::vector<int>(1, POLLNVAL), invalid.calls);
    EXPECT_EQ(-1, invalid.close());
    EXPECT_EQ(EBADF, errno);
    EXPECT_EQ(-1, invalid.fd());
}

TEST_F(MultiplexerTest, FailedPollRunsTimersButNoHandlers) {
    std::unique_ptr<Probe> probe = ready_probe();
    mux.run_once();  // leaves returned events in the poll array
    EXPECT_EQ(-1, g_timeout);
    int fired = 0;
    mux.timer_mgr().add_timer(
        0, [](void* n) { ++*static_cast<int*>(n); }, &fired);
    g_poll_error = EINTR;
    LogCapture log;
    mux.run_once();
    EXPECT_EQ(1, fired);
    EXPECT_EQ(ONE_INPUT, probe->calls);
    EXPECT_EQ("", log.text());
}

TEST_F(MultiplexerTest, WaitsForTheEarliestTimerOrWithoutLimit) {
    boot_clock::freeze();
    int fired = 0;
    const auto count = [](void* n) { ++*static_cast<int*>(n); };
    mux.timer_mgr().add_timer(60000, count, &fired);
    mux.timer_mgr().add_timer(30, count, &fired);
    mux.run_once();
    EXPECT_EQ(30, g_timeout);
    boot_clock::advance(30);
    mux.run_once();
    EXPECT_EQ(0, g_timeout);
    EXPECT_EQ(1, fired);
    Multiplexer empty;
    g_poll_error = EINTR;  // it would wait for ever
    empty.run_once();
    EXPECT_EQ(-1, g_timeout);
}

TEST_F(MultiplexerTest, TimersRunBeforeHandlersAndMayDestroyThem) {
    std::vector<std::unique_ptr<Probe>> probes;
    probes.push_back(ready_probe());
    probes.push_back(ready_probe());
    mux.timer_mgr().add_timer(
        0,
        [](void* data) {
            auto& list = *static_cast<std::vector<std::unique_ptr<Probe>>*>(data);
            EXPECT_TRUE(list[1]->calls.empty());
            list.erase(list.begin());
        },
        &probes);
    mux.run_once();
    EXPECT_EQ(2u, g_polled.size());
    ASSERT_EQ(1u, probes.size());
    EXPECT_EQ(ONE_INPUT, probes[0]->calls);
}

TEST_F(MultiplexerTest, HandlerMayDestroyItselfAndOthers) {
    const size_t descriptors = open_descriptors();
    Probe* self = ready_probe().release();
    std::unique_ptr<Probe> victim = ready_probe();
    std::unique_ptr<Probe> last = ready_probe();
    self->action = [&] {
        delete self;
        victim.reset();
        // A new handler, likely at an address just freed, waits for the next pass.
        victim = ready_probe();
    };
    mux.run_once();
    EXPECT_EQ(3u, g_polled.size());
    EXPECT_TRUE(victim->calls.empty());
    EXPECT_EQ(ONE_INPUT, last->calls);
    mux.run_once();
    EXPECT_EQ(2u, g_polled.size());
    EXPECT_EQ(ONE_INPUT, victim->calls);
    // Whatever the events, and also when the descriptor is closed already.
    victim->close();
    last->add_events(POLLOUT);
    victim.reset();
    last.reset();
    pass();
    EXPECT_TRUE(g_polled.empty());
    EXPECT_EQ(descriptors, open_descriptors());
}

TEST_F(MultiplexerTest, RegistrationChangedWhileDispatchingCountsFromTheNextPass) {
    std::unique_ptr<Probe> first = ready_probe();
    std::unique_ptr<Probe> removed = ready_probe();
    std::unique_ptr<Probe> reopened = ready_probe();
    std::unique_ptr<Probe> narrowed(new Probe(&mux, POLLIN | POLLOUT));
    Probe added(&mux, 0);
    added.make_ready();
    first->action = [&] {
        first->action = nullptr;
        removed->del_events(POLLIN);
        reopened->del_events(POLLIN);
        reopened->reopen();
        EXPECT_EQ(0, reopened->add_events(POLLIN));
        reopened->make_ready();
        narrowed->del_events(POLLOUT);
        EXPECT_EQ(0, added.add_events(POLLIN));
    };
    mux.run_once();
    EXPECT_TRUE(removed->calls.empty());
    EXPECT_TRUE(reopened->calls.empty());
    EXPECT_TRUE(added.calls.empty());
    EXPECT_EQ(std::vector<int>(1, POLLOUT), narrowed->calls);  // still registered: as polled
    mux.run_once();
    EXPECT_TRUE(removed->calls.empty());
    EXPECT_EQ(ONE_INPUT, reopened->calls);
    EXPECT_EQ(ONE_INPUT, added.calls);
    EXPECT_EQ(1u, narrowed->calls.size());
}

// A descriptor that hung up is ready for ever: it took a whole core.
TEST_F(MultiplexerTest, HandlerThatGetsNothingDoneIsLeftAloneForAWhile) {
    boot_clock::freeze();
    LogCapture log;
    Probe hung(&mux, POLLIN);
    Probe other(&mux, POLLOUT);
    hung.hang_up();
    hung.action = [&] { hung.note_idle("hung device"); };
    for (int i = 0; i < 30; ++i) {
        mux.run_once();
    }
    EXPECT_EQ(10u, hung.calls.size());
    EXPECT_EQ(30u, other.calls.size());
    EXPECT_EQ(1u, log.count("void FdHandler::note_idle(const char*): hung device gave nothing 10 "
                            "times in a row, left alone for 3000 ms at a time\n"));

    // One try after each rest, even if the descriptor was closed and opened meanwhile.
    hung.del_events(POLLIN);
    hung.reopen();
    EXPECT_EQ(0, hung.add_events(POLLIN));
    hung.hang_up();
    boot_clock::advance(2999);
    mux.run_once();
    EXPECT_EQ(10u, hung.calls.size());
    for (int i = 0; i < 3; ++i) {
        boot_clock::advance(3000);
        for (int j = 0; j < 5; ++j) {
            mux.run_once();
        }
    }
    EXPECT_EQ(13u, hung.calls.size());
    EXPECT_EQ(1u, log.count("left alone"));

    // Data counts afresh and ends the rest.
    EXPECT_TRUE(hung.resting());
    hung.note_alive();
    for (int i = 0; i < 30; ++i) {
        mux.run_once();
    }
    EXPECT_EQ(23u, hung.calls.size());
    EXPECT_EQ(2u, log.count("left alone"));

    // Without a clock nothing would end a rest.
    hung.note_alive();
    boot_clock::fail();
    for (int i = 0; i < 30; ++i) {
        mux.run_once();
    }
    EXPECT_EQ(53u, hung.calls.size());
}

// One that finds the table full is refused, or waits for room: it stayed unpolled for good.
TEST_F(MultiplexerTest, TableTakesTwentyHandlers) {
    LogCapture log;
    std::vector<std::unique_ptr<Probe>> probes;
    for (size_t i = 0; i < Multiplexer::MAX_HANDLERS; ++i) {
        probes.push_back(ready_probe());
    }
    Probe first(&mux, 0), withdrawn(&mux, 0), last(&mux, 0);
    std::unique_ptr<Probe> destroyed(new Probe(&mux, 0));
    EXPECT_EQ(-1, last.add_events(POLLIN));
    EXPECT_EQ(0, probes[19]->add_events(POLLOUT));
    for (Probe* probe : {&first, &withdrawn, destroyed.get(), &last}) {
        probe->make_ready();
        probe->poll_when_room(POLLIN, "some device");
    }
    EXPECT_EQ(4u,
              log.count("void FdHandler::poll_when_room(int, const char*): no room to poll some "
                        "device, waiting for it [105(No buffer space available)]\n"));
    withdrawn.del_events(POLLIN);
    destroyed.reset();
    mux.run_once();
    EXPECT_EQ(20u, g_polled.size());
    EXPECT_EQ(ONE_INPUT, probes[0]->calls);
    EXPECT_EQ(std::vector<int>(1, POLLIN | POLLOUT), probes[19]->calls);
    EXPECT_TRUE(first.calls.empty());
    probes.erase(probes.begin());
    mux.run_once();
    EXPECT_EQ(ONE_INPUT, first.calls);
    EXPECT_EQ(first.fd(), g_polled[19].fd);
    EXPECT_TRUE(last.calls.empty());
    probes.clear();
    mux.run_once();
    EXPECT_EQ(ONE_INPUT, last.calls);
    EXPECT_TRUE(withdrawn.calls.empty());
}
