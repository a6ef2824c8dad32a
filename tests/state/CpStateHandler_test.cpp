// SPDX-License-Identifier: Apache-2.0

#include "state/CpStateHandler.h"

#include "sim/SimSupervisor.h"
#include "state/ModemStateHandler.h"
#include "support/ControlFixture.h"

namespace {

constexpr char SUPERVISOR[] = "supervisor_test";

// The handler has a loop of its own, so that nothing else is in it.
class CpStateHandlerTest : public ControlFixture {
protected:
    CpStateHandlerTest() {
        // Events then only change the state of the channel.
        root.set_prop("persist.sys.vexa.modemreset", "1");
        root.set_prop("persist.sys.vexa.wcnreset", "1");
        EXPECT_TRUE(supervisor.start(SUPERVISOR, root.root()));
    }

    // Sends one message, which is read in one piece; gives the state of the CP then.
    CpWorkState say(const std::string& message, const std::string& logged) {
        log.clear();
        EXPECT_TRUE(supervisor.send(message));
        EXPECT_TRUE(pump_until(loop, [&] { return log.has("bytes: "); }));
        EXPECT_TRUE(log.has("virtual int CpStateHandler::process_data(): " + logged + "\n"))
            << log.text();
        EXPECT_EQ(log.count("\n"), 1u);
        return state(CT_WCDMA);
    }
    void connect(CpStateHandler& handler) {
        EXPECT_EQ(handler.init(), 0);
        ASSERT_TRUE(supervisor.connected());
    }
    bool reconnected() {
        return pump_until(loop, [&] { return supervisor.connected(); });
    }
    int timeout() {
        int ms = -2;
        loop.timer_mgr().get_timeout(&ms);
        return ms;
    }
    CpWorkState state(CpType type) { return ctrl->get_cp(type)->state(); }

    Multiplexer loop;
    SimSupervisor supervisor;
    std::unique_ptr<ModemStateHandler> modem{new ModemStateHandler(ctrl.get(), &loop, SUPERVISOR)};
};

// No supervisor, or no room in the loop: it tries again later.
TEST_F(CpStateHandlerTest, ConnectsAfterTheSupervisorAppears) {
    boot_clock::freeze();
    supervisor.stop();
    log.clear();
    EXPECT_EQ(modem->init(), 0);
    EXPECT_EQ(modem->init(), 0);  // still one attempt pending
    EXPECT_EQ(modem->fd(), -1);
    EXPECT_EQ(timeout(), 3000);
    EXPECT_TRUE(supervisor.start(SUPERVISOR, root.root()));
    boot_clock::advance(3000);
    loop.run_once();
    ASSERT_TRUE(supervisor.connected());
    EXPECT_EQ(log.text(), "");
    EXPECT_EQ(say("Modem\nAssert\n", "13 bytes: Modem\\x0aAssert"), CWS_WORKING);
    EXPECT_EQ(say("Modem Assert", "12 bytes: Modem Assert"), CWS_NOT_WORKING);
    modem->init();  // connected: nothing to do
    EXPECT_TRUE(supervisor.connected() && supervisor.accepted() == 1);
}

// It was connected 19,000 times a second.
TEST_F(CpStateHandlerTest, SupervisorThatClosesAtOnce) {
    boot_clock::freeze();
    modem->init();
    const auto accept_and_close = [&] {
        for (int i = 0; i < 30; ++i) {
            supervisor.connected();
            supervisor.drop();
            pump_once(loop);
        }
        return supervisor.accepted();
    };
    EXPECT_EQ(accept_and_close(), 11u);
    EXPECT_EQ(log.count("supervisor_test gave nothing 10 times in a row"), 1u);
    boot_clock::advance(3000);
    EXPECT_EQ(accept_and_close(), 12u);
    boot_clock::advance(3000);
    // Nor is one of use that tells of an event before it closes.
    ASSERT_TRUE(reconnected() && supervisor.send("Modem Assert"));
    supervisor.drop();
    EXPECT_EQ(accept_and_close(), 13u);
    boot_clock::advance(3000);
    EXPECT_TRUE(pump_until(loop, [&] { return state(CT_WCDMA) == CWS_NOT_WORKING; }));
    // The next one stays; then it counts afresh.
    ASSERT_TRUE(reconnected());
    EXPECT_TRUE(modem->resting());
    boot_clock::advance(6000);
    EXPECT_EQ(say("Modem Alive", "11 bytes: Modem Alive"), CWS_WORKING);
    supervisor.drop();
    EXPECT_EQ(accept_and_close(), 14u + 11);
    EXPECT_EQ(log.count("gave nothing"), 1u);
}

// Ten readings in weeks that came to nothing made it rest with each further one: messages that
// arrive meanwhile are one.
TEST_F(CpStateHandlerTest, IdleReadingsCountInARowOnly) {
    boot_clock::freeze();
    connect(*modem);
    boot_clock::advance(6000);
    pump_once(loop);
    bool nothing = false;
    faults::instead.read = [&](int fd, void* data, size_t len) {
        nothing = fd == modem->fd() && !nothing;
        return nothing ? (errno = EAGAIN, ssize_t{-1}) : real::read(fd, data, len);
    };
    for (int i = 0; i < 12; ++i) {
        EXPECT_EQ(say("Modem Alive", "11 bytes: Modem Alive"), CWS_WORKING);
    }
    EXPECT_FALSE(modem->resting());
    EXPECT_EQ(modem->idle_wakeups(), 0u);
    faults::instead = {};
}

TEST_F(CpStateHandlerTest, ReconnectsAtOnceAndLeaksNothing) {
    connect(*modem);
    const size_t descriptors = open_descriptors();
    for (int i = 0; i < 5; ++i) {
        supervisor.send("Modem Al");
        supervisor.drop();
        ASSERT_TRUE(reconnected());
        EXPECT_EQ(open_descriptors(), descriptors);
        EXPECT_EQ(say("ive", "3 bytes: ive"), CWS_WORKING);
    }
    modem->process_conn_error(EIO);
    EXPECT_TRUE(supervisor.connected() && supervisor.accepted() == 7);

    // Gone for good: the retry is armed, once, and goes with the handler.
    supervisor.stop();
    ASSERT_TRUE(pump_until(loop, [&] { return modem->fd() == -1 && timeout() > 100; }));
    EXPECT_EQ(Filler::free_slots(loop), Multiplexer::MAX_HANDLERS);
    modem.reset();
    EXPECT_EQ(timeout(), -1);
}

}  // namespace
