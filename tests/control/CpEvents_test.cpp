// SPDX-License-Identifier: Apache-2.0
// From a supervisor's message to files and notifications, through the real sockets.
#include <list>

#include "sim/SimSupervisor.h"
#include "storage/MediaStorage.h"
#include "support/ServiceFixture.h"
#include "support/fake_devices.h"

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

    SimSupervisor modemd, wcnd;
};

TEST_F(CpEventsTest, EventsForNobody) {
    ASSERT_NO_FATAL_FAILURE(boot_supervised());
    ctrl->process_cp_evt(CT_TD, CpStateHandler::CE_ASSERT);
    EXPECT_TRUE(log.has("CpEvent): kestcp: unknown MODEM type 1 asserts ["));
    ctrl->process_cp_evt(CT_WANMODEM, static_cast<CpStateHandler::CpEvent>(4));
    EXPECT_TRUE(log.has("CpEvent): unknown event 4 ["));
}

// Everything on took all places: nobody heard requests and supervisors any more.
TEST_F(CpEventsTest, CapturesLeaveRoomForControl) {
    FakeDevice device(root.path("dev/iq_mem"));
    std::list<Fifo> devices;
    std::string settings;
    for (const char* name : {"log", "pcm", "mem"}) {
        devices.emplace_back(root.path("dev/audio_dsp_") + name);
    }
    for (const char* kind : {"w", "t", "tl", "lf", "l", "wcn"}) {
        devices.emplace_back(root.path(kind));
        for (const std::string use : {".log", ".diag"}) {
            root.set_prop("ro.modem." + (kind + use), root.path(kind));
        }
    }
    const std::string modems[] = {"cp_wcdma", "cp_td-scdma", "cp_3mode", "cp_4mode", "cp_5mode"};
    for (const std::string& name : modems) {
        settings += "stream " + name + " on 5 3\niq " + name + " WCDMA\n";
    }
    ASSERT_EQ(boot(settings + "stream cp_wcn on 5 3\nstream cp_gnss on 5 3\nstream agdsp on 5 3\n"),
              0);
    std::list<Client> clients;
    for (int i = 0; i < 3; ++i) {
        clients.emplace_back();
        ASSERT_EQ(ask(clients.back(), "SUBSCRIBE WCN DUMP\n", "OK\n"), "OK\n");
    }
    EXPECT_EQ(Filler::free_slots(mux()), 1u);
    EXPECT_FALSE(log.has("no room to poll server"));
    EXPECT_FALSE(log.has("no room to poll modemd"));
    EXPECT_FALSE(log.has("no room to poll external_wcn_kest"));
    EXPECT_FALSE(log.has("no room to poll log device"));
    // The first captures go on, whoever waits; the last one takes its turn when they end.
    const auto captured = [&](const std::string& name) {
        device.fill(0, 100);
        return pump([&] { return !root.find("/" + name + "_wiq_").empty(); });
    };
    for (int i = 0; i < 3; ++i) {
        ASSERT_TRUE(captured("cp_wcdma")) << i;
        ASSERT_EQ(ctrl->clear_log(), 0);
    }
    const CpType first[] = {CT_WCDMA, CT_TD, CT_3MODE, CT_4MODE};
    ASSERT_EQ(ctrl->disable_log(first, 4), 0);
    EXPECT_TRUE(captured("cp_5mode"));
}

// With its log off a modem that crashed again and again filled the medium.
TEST_F(CpEventsTest, CrashesKeepTheQuota) {
    root.write_file("d/dipx/smsg", std::string(100000, 's'));
    ASSERT_NO_FATAL_FAILURE(boot_supervised());
    const CpType type = CT_WCDMA;
    ASSERT_EQ(ctrl->disable_log(&type, 1) + ctrl->set_data_part_size(1), 0);
    for (int i = 0; i < 15; ++i) {
        modem()->process_assert(false);
        modem()->process_alive();
    }
    EXPECT_LE(ctrl->stor_mgr().get_media_stor()->size(), (1u << 20) + 100002);
    EXPECT_GT(files().size(), 2u);
}

// A medium that does not take the material: the other one does, or room is made; not by deleting
// what was just saved. A dying card may take a single byte.
TEST_F(CpEventsTest, CrashMaterialOutlivesItsMedium) {
    const std::string stamp(STAMP), smsg = "smsg" + stamp + ".log";
    const struct {
        const char* what;
        int error;
        const char* failing;  // in the path
        std::string medium;
        std::string full;  // as long as an older set is there
        const char* lost;
    } cases[] = {
        {"the card fails", EIO, "/sd/", "data:", "", ""},
        {"the card fails, full inside", EIO, "/sd/", "data:", "data", ""},
        {"both fail", EIO, "/sd/", "data:", "", "save DIPX smsg info failed [20("},
        {"full", 0, "?", "sd:", "sd", ""},
        {"full for the dump", ENOSPC, "mini_dump", "sd:", "", "save mini dump error [28("},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        const std::string old = c.full + "/modem_log/2016-02-01-00-00-00/cp_gnss/old";
        if (!c.full.empty()) {
            root.write_file(old, std::string(3 << 20, 'x'));
        }
        set_card(true);
        ASSERT_NO_FATAL_FAILURE(boot_supervised());
        ASSERT_TRUE(both_log("<start>"));
        const bool inside = strcmp(c.what, "both fail") != 0;
        if (!inside) {
            remove_tree("data/modem_log");
            root.write_file("data/modem_log", "in the way");
        }
        faults::instead.write = [&](int fd, const void* data, size_t len) {
            const std::string path = faults::path_of(fd);
            const bool full = !c.full.empty() && root.exists(old) &&
                              path.find("/" + c.full + "/") != std::string::npos;
            const bool fails = path.find(c.failing) != std::string::npos &&
                               path.find(".write_test") == std::string::npos;
            errno = full ? ENOSPC : c.error;
            return full || fails ? ssize_t{-1} : real::write(fd, data, len);
        };
        modem()->process_assert(true);
        faults::instead = {};
        EXPECT_TRUE(log.has(c.lost)) << log.text();
        Files saved = files("cp_wcdma");
        EXPECT_EQ(saved[c.medium + smsg], inside ? "S" : "");
        EXPECT_EQ(saved[c.medium + "mini_dump" + stamp + ".bin"], *c.lost ? "" : "MINI W");
        end_service();
        if (!inside) {
            remove_tree("data/modem_log");
        }
    }
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
