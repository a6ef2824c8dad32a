#include "state/CpStateHandler.h"

#include <gtest/gtest.h>

#include <memory>

#include "client/ControlFixture.h"
#include "state/ExtWcnStateHandler.h"
#include "state/ModemStateHandler.h"

namespace {

constexpr char SUPERVISOR[] = "supervisor_test";

// A supervisor's side: listens, and accepts when asked.
struct Supervisor {
    Supervisor()
        : server(socket_local_server(SUPERVISOR, ANDROID_SOCKET_NAMESPACE_ABSTRACT,
                                     SOCK_STREAM | SOCK_NONBLOCK)) {}
    // The service's connection; null when there is none waiting.
    std::unique_ptr<Peer> accept() const {
        const int fd = accept4(server.fd, nullptr, nullptr, SOCK_CLOEXEC);
        return std::unique_ptr<Peer>(fd < 0 ? nullptr : new Peer(fd));
    }
    Peer server;
};

// The handler has a loop of its own, so that nothing else is in it.
class CpStateHandlerTest : public ControlFixture {
protected:
    CpStateHandlerTest() {
        // Events then only change the state of the channel.
        root.set_prop("persist.sys.vexa.modemreset", "1");
        root.set_prop("persist.sys.vexa.wcnreset", "1");
    }

    // Sends one message, which is read in one piece, and gives the line logged for it.
    std::string say(Peer& supervisor, const std::string& message) {
        log.clear();
        EXPECT_TRUE(supervisor.send(message));
        EXPECT_TRUE(run_until(loop, [&] { return log.has("bytes: "); }));
        const std::string text = log.text();
        const std::string mark = "virtual int CpStateHandler::process_data(): ";
        const size_t at = text.find(mark);
        EXPECT_NE(at, std::string::npos) << text;
        return at == std::string::npos
                   ? text
                   : text.substr(at + mark.size(), text.find('\n', at) - at - mark.size());
    }
    int timeout() {
        int ms = -2;
        loop.timer_mgr().get_timeout(&ms);
        return ms;
    }
    CpWorkState state(CpType type) { return ctrl.get_cp(type)->state(); }

    Multiplexer loop;
};

TEST_F(CpStateHandlerTest, Patterns) {
    typedef CpStateHandler S;
    ModemStateHandler modem(&ctrl, &loop, SUPERVISOR);
    ExtWcnStateHandler wcn(&ctrl, &loop, SUPERVISOR);
    static const struct {
        bool is_wcn;
        std::string text;
        S::CpEvent event;
    } CASES[] = {
        {false, "TD Modem Assert", S::CE_ASSERT},
        {false, "Modem Assert", S::CE_ASSERT},
        {false, "Modem Alive", S::CE_ALIVE},
        {false, "Modem Blocked", S::CE_BLOCKED},
        {false, "x\nModem Assert: reason\n", S::CE_ASSERT},
        {false, std::string("\0\xff", 2) + "Modem Blocked" + std::string(1, '\0'), S::CE_BLOCKED},
        {false, "Modem Alive Modem Assert", S::CE_ASSERT},
        {false, "Modem Blocked Modem Alive", S::CE_ALIVE},
        {false, "MModem Alive", S::CE_ALIVE},
        {false, "Modem Asser", S::CE_NONE},
        {false, "modem assert", S::CE_NONE},
        {false, "Modem  Alive", S::CE_NONE},
        {false, "WCN-EXTERNAL-DUMP", S::CE_NONE},
        {false, "", S::CE_NONE},
        {true, "WCN-EXTERNAL-ALIVE", S::CE_ALIVE},
        {true, "WCN-EXTERNAL-DUMP\n", S::CE_ASSERT},
        {true, "WCN-EXTERNAL-DUMP WCN-EXTERNAL-ALIVE", S::CE_ALIVE},
        {true, "WCN-EXTERNAL-DUM", S::CE_NONE},
        {true, "Modem Assert", S::CE_NONE},
    };
    for (const auto& c : CASES) {
        // A copy of exactly that size, for the sanitizer to watch.
        std::unique_ptr<uint8_t[]> text(new uint8_t[c.text.size()]);
        memcpy(text.get(), c.text.data(), c.text.size());
        CpStateHandler& handler = c.is_wcn ? static_cast<CpStateHandler&>(wcn) : modem;
        CpType type = CT_GNSS;
        EXPECT_EQ(handler.parse_notify(text.get(), c.text.size(), type), c.event) << c.text;
        EXPECT_EQ(type, !c.is_wcn ? CT_WANMODEM : c.event ? CT_WCN : CT_GNSS) << c.text;
    }
}

TEST_F(CpStateHandlerTest, MessagesBecomeEventsOfTheCp) {
    Supervisor supervisor;
    ModemStateHandler modem(&ctrl, &loop, SUPERVISOR);
    EXPECT_EQ(modem.init(), 0);
    std::unique_ptr<Peer> to_modem = supervisor.accept();
    ASSERT_TRUE(to_modem);
    static const struct {
        const char* message;
        const char* logged;
        CpWorkState state;
    } CASES[] = {
        {"Modem Assert", "12 bytes: Modem Assert", CWS_NOT_WORKING},
        {"hello", "5 bytes: hello", CWS_NOT_WORKING},
        {"Modem Alive\n", "12 bytes: Modem Alive", CWS_WORKING},
        {"Modem Blocked", "13 bytes: Modem Blocked", CWS_NOT_WORKING},
        {"Modem Al", "8 bytes: Modem Al", CWS_NOT_WORKING},
        {"ive", "3 bytes: ive", CWS_NOT_WORKING},  // reads are never combined
        {"Modem Alive", "11 bytes: Modem Alive", CWS_WORKING},
        {"Modem Alive\nTD Modem Assert\n", "28 bytes: Modem Alive\\x0aTD Modem Assert",
         CWS_NOT_WORKING},
    };
    for (const auto& c : CASES) {
        EXPECT_EQ(say(*to_modem, c.message), c.logged);
        EXPECT_EQ(state(CT_WCDMA), c.state) << c.message;
    }
    EXPECT_EQ(state(CT_WCN), CWS_WORKING);

    ExtWcnStateHandler wcn(&ctrl, &loop, SUPERVISOR);
    wcn.init();
    std::unique_ptr<Peer> to_wcn = supervisor.accept();
    ASSERT_TRUE(to_wcn);
    say(*to_wcn, "WCN-EXTERNAL-DUMP");
    EXPECT_EQ(state(CT_WCN), CWS_NOT_WORKING);
    say(*to_wcn, "WCN-EXTERNAL-ALIVE");
    EXPECT_EQ(state(CT_WCN), CWS_WORKING);
    EXPECT_EQ(state(CT_WCDMA), CWS_NOT_WORKING);
}

// One line a read, in printable text, with nothing hidden behind a NUL.
TEST_F(CpStateHandlerTest, AnyBytesAreLoggedSafely) {
    Supervisor supervisor;
    ModemStateHandler modem(&ctrl, &loop, SUPERVISOR);
    modem.init();
    std::unique_ptr<Peer> peer = supervisor.accept();
    ASSERT_TRUE(peer);
    static const struct {
        std::string message;
        const char* logged;
    } CASES[] = {
        {std::string("a\0b\n", 4), "4 bytes: a\\x00b"},
        {"a\nE/KESTCP(1): b\r\n", "18 bytes: a\\x0aE/KESTCP(1): b"},
        {"%s%n\t\\\x1b[2J\xff\x7f", "12 bytes: %s%n\\x09\\x5c\\x1b[2J\\xff\\x7f"},
        {std::string("end\0", 4), "4 bytes: end"},
        {std::string("\n\0", 2), "2 bytes: "},
    };
    for (const auto& c : CASES) {
        EXPECT_EQ(say(*peer, c.message), c.logged);
        EXPECT_EQ(log.count("\n"), 1u) << log.text();
    }
    // A full buffer of the longest bytes, and a stream longer than the buffer.
    std::string escaped;
    for (int i = 0; i < 256; ++i) {
        escaped += "\\x81";
    }
    EXPECT_EQ(say(*peer, std::string(256, '\x81')), "256 bytes: " + escaped);
    say(*peer, std::string(300, 'x') + "Modem Assert");
    EXPECT_TRUE(run_until(loop, [&] { return state(CT_WCDMA) == CWS_NOT_WORKING; }));
    EXPECT_TRUE(log.has("256 bytes: xxx"));
    EXPECT_TRUE(log.has("56 bytes: xxx"));
}

TEST_F(CpStateHandlerTest, ConnectsAfterTheSupervisorAppears) {
    ModemStateHandler modem(&ctrl, &loop, SUPERVISOR);
    log.clear();
    EXPECT_EQ(modem.init(), 0);
    EXPECT_EQ(modem.init(), 0);  // still one attempt pending
    EXPECT_EQ(modem.fd(), -1);
    EXPECT_GT(timeout(), 2500);
    EXPECT_LE(timeout(), 3000);
    Supervisor supervisor;
    loop.run_once();  // until the timer fires
    std::unique_ptr<Peer> peer = supervisor.accept();
    ASSERT_TRUE(peer);
    EXPECT_EQ(timeout(), -1);
    EXPECT_EQ(log.text(), "");
    say(*peer, "Modem Assert");
    EXPECT_EQ(state(CT_WCDMA), CWS_NOT_WORKING);
    modem.init();  // connected: nothing to do
    EXPECT_FALSE(supervisor.accept());
}

TEST_F(CpStateHandlerTest, ReconnectsAtOnceAndLeaksNothing) {
    std::unique_ptr<Supervisor> supervisor(new Supervisor);
    std::unique_ptr<ModemStateHandler> modem(new ModemStateHandler(&ctrl, &loop, SUPERVISOR));
    modem->init();
    std::unique_ptr<Peer> peer = supervisor->accept();
    ASSERT_TRUE(peer);
    const size_t descriptors = open_descriptors();
    for (int i = 0; i < 10; ++i) {
        peer->send("Modem Al");
        peer->hang_up();
        ASSERT_TRUE(run_until(loop, [&] { return (peer = supervisor->accept()) != nullptr; }));
        EXPECT_EQ(open_descriptors(), descriptors);
        EXPECT_EQ(say(*peer, "ive"), "3 bytes: ive");
    }
    modem->process_conn_error(EIO);
    ASSERT_TRUE((peer = supervisor->accept()));
    say(*peer, "Modem Assert");
    EXPECT_EQ(state(CT_WCDMA), CWS_NOT_WORKING);

    // Gone for good: the retry is armed, once, and goes with the handler.
    supervisor.reset();
    peer.reset();
    ASSERT_TRUE(run_until(loop, [&] { return modem->fd() == -1; }));
    ASSERT_TRUE(wait_until([&] { return pass(loop), timeout() > 100; }));
    EXPECT_EQ(Occupants(loop).size(), Multiplexer::MAX_HANDLERS);
    modem.reset();
    EXPECT_EQ(timeout(), -1);
}

TEST_F(CpStateHandlerTest, WithoutRoomInTheLoopItTriesAgain) {
    Supervisor supervisor;
    ModemStateHandler modem(&ctrl, &loop, SUPERVISOR);
    Occupants occupants(loop);
    EXPECT_EQ(modem.init(), 0);
    EXPECT_EQ(modem.fd(), -1);
    EXPECT_GT(timeout(), 2500);
    EXPECT_TRUE(log.has("no room to poll"));
}

}  // namespace
