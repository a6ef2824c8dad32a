// SPDX-License-Identifier: Apache-2.0

#include "core/Multiplexer.h"

#include <errno.h>
#include <sys/socket.h>

#include <memory>

#include "core/FdHandler.h"
#include "support/TestRoot.h"
#include "support/faults.h"

namespace {

// A handler on one end of a socket pair; records its calls and runs an action in them.
class Probe : public FdHandler {
public:
    explicit Probe(Multiplexer* mux) : FdHandler(-1, nullptr, mux) {
        int fds[2];
        EXPECT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, fds), 0);
        m_fd = fds[0];
        m_peer = fds[1];
        EXPECT_EQ(add_events(POLLIN), 0);
    }
    ~Probe() override { ::close(m_peer); }

    void make_ready() const { EXPECT_EQ(write(m_peer, "x", 1), 1); }

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
            errno = poll_error;
            return poll_error ? -1 : real::poll(fds, num, timeout);
        };
    }
    ~MultiplexerTest() override {
        faults::instead = {};
        boot_clock::real();
    }
    std::unique_ptr<Probe> ready_probe() {
        std::unique_ptr<Probe> probe(new Probe(&mux));
        probe->make_ready();
        return probe;
    }
    Multiplexer mux;
    // What the loop handed to the last poll, and an error to give instead of polling.
    std::vector<struct pollfd> polled;
    int poll_error = 0;
};

const std::vector<int> ONE_INPUT(1, POLLIN);

}  // namespace

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
