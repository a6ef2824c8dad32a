// SPDX-License-Identifier: Apache-2.0

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
#include "support/faults.h"

namespace {

// A handler on one end of a socket pair; records its calls and runs an action in them.
class Probe : public FdHandler {
public:
    Probe(Multiplexer* mux, int events) : FdHandler(-1, nullptr, mux) {
        open();
        if (events) {
            EXPECT_EQ(add_events(events), 0);
        }
    }
    ~Probe() override { ::close(m_peer); }

    void open() {
        int fds[2];
        EXPECT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, fds), 0);
        m_fd = fds[0];
        m_peer = fds[1];
    }
    void reopen() {
        close();
        hang_up();
        open();
    }
    void make_ready() const { EXPECT_EQ(write(m_peer, "x", 1), 1); }
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
    MultiplexerTest() {
        faults::instead.poll = [this](struct pollfd* fds, nfds_t num, int timeout) {
            polled.assign(fds, fds + num);
            waited = timeout;
            errno = poll_error;
            return poll_error ? -1 : real::poll(fds, num, timeout);
        };
    }
    ~MultiplexerTest() override {
        faults::instead = {};
        boot_clock::real();
    }
    std::unique_ptr<Probe> ready_probe() {
        std::unique_ptr<Probe> probe(new Probe(&mux, POLLIN));
        probe->make_ready();
        return probe;
    }
    Multiplexer mux;
    // What the loop handed to the last poll, and an error to give instead of polling.
    std::vector<struct pollfd> polled;
    int waited = 0;
    int poll_error = 0;
};

const std::vector<int> ONE_INPUT(1, POLLIN);

}  // namespace

TEST_F(MultiplexerTest, ErrorEventsAreDispatched) {
    Probe hung(&mux, POLLIN);
    hung.hang_up();
    Probe invalid(&mux, POLLIN);
    ::close(invalid.fd());
    mux.run_once();
    EXPECT_EQ(hung.calls, std::vector<int>(1, POLLIN | POLLHUP));
    EXPECT_EQ(invalid.calls, std::vector<int>(1, POLLNVAL));
    EXPECT_EQ(invalid.close(), -1);
    EXPECT_EQ(errno, EBADF);
    EXPECT_EQ(invalid.fd(), -1);
}

TEST_F(MultiplexerTest, FailedPollRunsTimersButNoHandlers) {
    boot_clock::freeze();
    std::unique_ptr<Probe> probe = ready_probe();
    mux.run_once();  // leaves returned events in the poll array
    EXPECT_EQ(waited, -1);
    int fired = 0;
    mux.timer_mgr().add_timer(
        30, [](void* n) { ++*static_cast<int*>(n); }, &fired);
    poll_error = EINTR;
    LogCapture log;
    std::vector<useconds_t> pauses;
    faults::instead.usleep = [&](useconds_t us) { return pauses.push_back(us), 0; };
    mux.run_once();
    EXPECT_EQ(waited, 30);
    EXPECT_EQ(fired, 0);
    boot_clock::advance(30);
    mux.run_once();
    EXPECT_EQ(waited, 0);
    EXPECT_EQ(fired, 1);
    EXPECT_EQ(probe->calls, ONE_INPUT);
    EXPECT_EQ(log.text(), "");
    // Only after a signal it is tried again at once.
    EXPECT_TRUE(pauses.empty());
    poll_error = ENOMEM;
    mux.run_once();
    EXPECT_EQ(pauses, std::vector<useconds_t>(1, 100000));
}

TEST_F(MultiplexerTest, TimersAndThenHandlersMayDestroyHandlers) {
    const size_t descriptors = open_descriptors();
    std::unique_ptr<Probe> of_timer = ready_probe();
    Probe* self = ready_probe().release();
    std::unique_ptr<Probe> victim = ready_probe();
    std::unique_ptr<Probe> last = ready_probe();
    mux.timer_mgr().add_timer(
        0, [](void* probe) { static_cast<std::unique_ptr<Probe>*>(probe)->reset(); }, &of_timer);
    self->action = [&] {
        EXPECT_FALSE(of_timer);
        delete self;
        victim.reset();
        // A new handler, likely at an address just freed, waits for the next pass.
        victim = ready_probe();
    };
    mux.run_once();
    EXPECT_EQ(polled.size(), 4u);
    EXPECT_TRUE(victim->calls.empty());
    EXPECT_EQ(last->calls, ONE_INPUT);
    mux.run_once();
    EXPECT_EQ(polled.size(), 2u);
    EXPECT_EQ(victim->calls, ONE_INPUT);
    // Whatever the events, and also when the descriptor is closed already.
    victim->close();
    last->add_events(POLLOUT);
    victim.reset();
    last.reset();
    poll_error = EINTR;  // it would wait for ever
    mux.run_once();
    EXPECT_TRUE(polled.empty());
    EXPECT_EQ(open_descriptors(), descriptors);
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
        EXPECT_EQ(reopened->add_events(POLLIN), 0);
        reopened->make_ready();
        narrowed->del_events(POLLOUT);
        EXPECT_EQ(added.add_events(POLLIN), 0);
    };
    mux.run_once();
    EXPECT_TRUE(removed->calls.empty());
    EXPECT_TRUE(reopened->calls.empty());
    EXPECT_TRUE(added.calls.empty());
    EXPECT_EQ(narrowed->calls, std::vector<int>(1, POLLOUT));  // still registered: as polled
    mux.run_once();
    EXPECT_TRUE(removed->calls.empty());
    EXPECT_EQ(reopened->calls, ONE_INPUT);
    EXPECT_EQ(added.calls, ONE_INPUT);
    EXPECT_EQ(narrowed->calls.size(), 1u);
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
    EXPECT_EQ(hung.calls.size(), 10u);
    EXPECT_EQ(other.calls.size(), 30u);
    const std::string left_alone =
        "void FdHandler::note_idle(const char*): hung device gave nothing 10 times in a row, "
        "left alone for 3000 ms at a time\n";
    EXPECT_EQ(log.count(left_alone), 1u);

    // One try after each rest, even if the descriptor was closed and opened meanwhile.
    hung.del_events(POLLIN);
    hung.reopen();
    EXPECT_EQ(hung.add_events(POLLIN), 0);
    hung.hang_up();
    boot_clock::advance(2999);
    mux.run_once();
    EXPECT_EQ(hung.calls.size(), 10u);
    for (int i = 0; i < 3; ++i) {
        boot_clock::advance(3000);
        for (int j = 0; j < 5; ++j) {
            mux.run_once();
        }
    }
    EXPECT_EQ(hung.calls.size(), 13u);
    EXPECT_EQ(log.count(left_alone), 1u);

    // Data counts afresh and ends the rest.
    EXPECT_TRUE(hung.resting());
    hung.note_alive();
    for (int i = 0; i < 30; ++i) {
        mux.run_once();
    }
    EXPECT_EQ(hung.calls.size(), 23u);
    EXPECT_EQ(log.count(left_alone), 2u);

    // Without a clock nothing would end a rest.
    hung.note_alive();
    boot_clock::fail();
    for (int i = 0; i < 30; ++i) {
        mux.run_once();
    }
    EXPECT_EQ(hung.calls.size(), 53u);
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
    EXPECT_EQ(last.add_events(POLLIN), -1);
    EXPECT_EQ(probes[19]->add_events(POLLOUT), 0);
    for (Probe* probe : {&first, &withdrawn, destroyed.get(), &last}) {
        probe->make_ready();
        probe->poll_when_room(POLLIN, "some device");
    }
    EXPECT_EQ(log.count("void FdHandler::poll_when_room(int, const char*): no room to poll some "
                        "device, waiting for it [105(No buffer space available)]\n"),
              4u);
    withdrawn.del_events(POLLIN);
    destroyed.reset();
    mux.run_once();
    EXPECT_EQ(polled.size(), 20u);
    EXPECT_EQ(probes[0]->calls, ONE_INPUT);
    EXPECT_EQ(probes[19]->calls, std::vector<int>(1, POLLIN | POLLOUT));
    EXPECT_TRUE(first.calls.empty());
    probes.erase(probes.begin());
    mux.run_once();
    EXPECT_EQ(first.calls, ONE_INPUT);
    EXPECT_EQ(polled[19].fd, first.fd());
    EXPECT_TRUE(last.calls.empty());
    probes.clear();
    mux.run_once();
    EXPECT_EQ(last.calls, ONE_INPUT);
    EXPECT_TRUE(withdrawn.calls.empty());
}
