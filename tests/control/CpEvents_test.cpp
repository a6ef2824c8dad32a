// SPDX-License-Identifier: Apache-2.0
// From a supervisor's message to files and notifications, through the real sockets.
#include "sim/SimSupervisor.h"
#include "support/ServiceFixture.h"

namespace {

class CpEventsTest : public FaultFixture {
protected:
    CpEventsTest() {
        root.write_file("d/dipx/smsg", "S");
        root.write_file("d/dipx/sbuf", "B");
        root.write_file("d/dipx/sblock", "K");
        root.write_file("proc/cpw/mini_dump", "MINI W");
        root.write_file("proc/cptl/mini_dump", "MINI TL");
        EXPECT_TRUE(modemd.start("modemd", root.root()));
        EXPECT_TRUE(wcnd.start("external_wcn_kest", root.root()));
    }

    void boot_supervised(const std::string& settings = "") {
        ASSERT_NO_FATAL_FAILURE(boot_modem(false, settings));
        ASSERT_TRUE(modemd.connected() && wcnd.connected());
    }
    bool reaches(LogPipeHandler* channel, CpWorkState state) {
        return pump([&] { return channel->state() == state; });
    }
    static Files records(const std::string& medium = "data:") {
        return {{medium + "smsg" + STAMP + ".log", "S"},
                {medium + "sbuf" + STAMP + ".log", "B"},
                {medium + "sblock" + STAMP + ".log", "K"}};
    }

    SimSupervisor modemd, wcnd;
};

TEST_F(CpEventsTest, ModemAssertsAndRecovers) {
    const struct {
        const char *message, *settings, *card, *reset;
        bool dumps;
        std::string mini_dump;  // the medium it goes to; "": none
    } cases[] = {
        {"TD Modem Assert", "minidump disable\texternal\n", "", "", true, ""},
        {"Modem Blocked\n", "minidump enable\texternal\n", "running", "2", true, "sd:"},
        {"Modem Blocked", "minidump enable\tinternal\n", "running", "0", true, "data:"},
        {"Modem Blocked", "minidump enable\tinternal\n", "", "1", false, "data:"},
        {"Modem Assert", "minidump disable\tinternal\n", "", "0x1", false, ""},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(std::string(c.message) + ", " + c.settings);
        root.set_prop("persist.sys.vexa.modemreset", c.reset);
        root.set_prop("init.svc.fuse_sdcard0", c.card);
        ASSERT_NO_FATAL_FAILURE(boot_supervised(c.settings));
        ASSERT_TRUE(both_log("<before>"));
        Client subscribers[2];
        Client other;
        for (Client& client : subscribers) {
            ASSERT_EQ(ask(client, "SUBSCRIBE WCDMA DUMP\n", "OK\n"), "OK\n");
        }
        ASSERT_EQ(ask(other, "SUBSCRIBE TD DUMP\n", "OK\n"), "OK\n");
        diag_dev.forget();

        ASSERT_TRUE(modemd.send(c.message));
        ASSERT_TRUE(reaches(modem(), c.dumps ? CWS_DUMP : CWS_NOT_WORKING));
        Files expected;
        if (c.dumps) {
            const std::string medium = *c.card ? "sd:" : "data:";
            expected = records(medium);
            expected[medium + "cp_wcdma_memory" + STAMP + ".dmp"] = "memory" + end_marker();
            EXPECT_TRUE(pump([&] { return diag_dev.received() == "3\n"; }));
            // Further events of the same crash change nothing.
            ASSERT_TRUE(modemd.send("Modem Blocked"));
            pump_once(mux());
            ASSERT_TRUE(supply(diag_dev, "memory" + end_marker()));
            const std::string lines = "CP_DUMP_START WCDMA\nCP_DUMP_END WCDMA\n";
            for (Client& client : subscribers) {
                EXPECT_EQ(hear(client, lines), lines);
            }
        }
        if (!c.mini_dump.empty()) {
            expected[c.mini_dump + "mini_dump" + STAMP + ".bin"] = "MINI W";
        }
        EXPECT_EQ(modem()->state(), CWS_NOT_WORKING);
        EXPECT_EQ(modem()->fd() < 0, c.dumps) << "stays open for a CP that is reset";
        EXPECT_EQ(files(), expected);
        ASSERT_TRUE(modemd.send("Modem Alive"));
        ASSERT_TRUE(reaches(modem(), CWS_WORKING));
        EXPECT_TRUE(both_log("<after>"));
        EXPECT_EQ(subscribers[0].heard() + subscribers[1].heard() + other.heard(), "");
        end_service();
    }
}

TEST_F(CpEventsTest, WcnHasItsOwnSupervisorAndReset) {
    root.set_prop("persist.sys.vexa.modemreset", "1");
    ASSERT_NO_FATAL_FAILURE(boot_supervised("stream cp_wcn off 5 3\n"));
    LogPipeHandler* wcn = ctrl->get_cp(CT_WCN);
    Files expected = records();
    for (bool mini_dump : {false, true}) {
        if (mini_dump) {
            ctrl->enable_md();
            expected[std::string("data:mini_dump") + STAMP + ".bin"] = "MINI TL";
        }
        ASSERT_TRUE(wcnd.send("WCN-EXTERNAL-DUMP"));
        ASSERT_TRUE(reaches(wcn, CWS_NOT_WORKING));
        EXPECT_EQ(files("cp_wcn"), expected);
        EXPECT_EQ(modem()->state(), CWS_WORKING);
        ASSERT_TRUE(wcnd.send("WCN-EXTERNAL-ALIVE"));
        EXPECT_TRUE(reaches(wcn, CWS_WORKING));
        EXPECT_EQ(wcn->fd(), -1) << "still switched off";
        ASSERT_EQ(ctrl->clear_log(), 0);
    }
}

TEST_F(CpEventsTest, RecordsFailOneByOne) {
    ASSERT_NO_FATAL_FAILURE(boot_supervised());
    struct tm t;
    localtime_r(&NOON, &t);
    for (const std::string record : {"smsg", "sbuf", "sblock"}) {
        Files expected = records();
        expected.erase("data:" + record + STAMP + ".log");
        ASSERT_EQ(rename(root.path("d/dipx/" + record).c_str(), root.path("aside").c_str()), 0);
        EXPECT_EQ(LogController::save_dipx_dump(modem()->storage(), t), -1);
        EXPECT_EQ(files(), expected);
        EXPECT_TRUE(log.has(": kestcp: save DIPX " + record + " info failed [2("));
        ASSERT_EQ(rename(root.path("aside").c_str(), root.path("d/dipx/" + record).c_str()), 0);
        ASSERT_EQ(ctrl->clear_log(), 0);
    }
    EXPECT_EQ(log.count(": kestcp: save DIPX "), 3u);
    EXPECT_EQ(LogController::save_dipx_dump(modem()->storage(), t), 0);
}

TEST_F(CpEventsTest, EventsForNobody) {
    ASSERT_NO_FATAL_FAILURE(boot_supervised());
    ctrl->process_cp_evt(CT_TD, CpStateHandler::CE_ASSERT);
    EXPECT_TRUE(log.has("CpEvent): kestcp: unknown MODEM type 1 asserts ["));
    ctrl->process_cp_evt(CT_WANMODEM, static_cast<CpStateHandler::CpEvent>(4));
    EXPECT_TRUE(log.has("CpEvent): unknown event 4 ["));
}

TEST_F(CpEventsTest, NoControlServer) {
    const int taken =
        socket_local_server("kestmodem", ANDROID_SOCKET_NAMESPACE_ABSTRACT, SOCK_STREAM);
    ASSERT_NO_FATAL_FAILURE(boot_supervised());
    ASSERT_TRUE(modemd.send("Modem Assert"));
    ASSERT_TRUE(pump([&] { return diag_dev.received() == "3\n"; }));
    ASSERT_TRUE(supply(diag_dev, end_marker()));
    EXPECT_EQ(modem()->state(), CWS_NOT_WORKING);
    EXPECT_EQ(files().size(), 4u);
    close(taken);
}

}  // namespace
