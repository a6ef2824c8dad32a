#include "channels/LogPipeHandler.h"

#include "channels/ChannelFixture.h"
#include "storage/CpStorage.h"
#include "support/boot_clock.h"

namespace {

const char ALL_ON[] = "stream cp_wcdma on 5 3\nstream cp_wcn on 5 3\nstream cp_gnss on 5 3\n";
const char ALL_OFF[] = "stream cp_wcdma off 5 3\nstream cp_wcn off 5 3\nstream cp_gnss off 5 3\n";
const char REPLY[] = "\x40\x42\x0f\0cp-time!";  // 1000000 s

class LogPipeHandlerTest : public ChannelFixture {
protected:
    LogPipeHandlerTest() {
        setenv("TZ", "UTC0", 1);
        tzset();
    }
    ~LogPipeHandlerTest() override { boot_clock::real(); }

    void pass(int times) {
        for (int i = 0; i < times; ++i) {
            pump_once(mux());
        }
    }
    std::string cp_dir(const std::string& cp) const {
        const std::vector<std::string> sets = root.list("data/modem_log");
        return sets.empty() ? "none" : "data/modem_log/" + sets.back() + "/" + cp;
    }
    // The content of the CP's file whose name starts so, in the newest set.
    std::string cp_file(const std::string& cp, const std::string& start) const {
        for (const std::string& name : root.list(cp_dir(cp))) {
            if (name.compare(0, start.size(), start) == 0) {
                return root.read_file(cp_dir(cp) + "/" + name);
            }
        }
        return "(none)";
    }

    const std::string record = std::string("\x78\x56\x34\x12") + std::string(REPLY, 12);
    LogPipeHandler* gnss = nullptr;
};

TEST_F(LogPipeHandlerTest, ReopensADeviceThatFailedOrWasMissing) {
    boot_clock::freeze();
    const std::string name = root.path("gnss");
    const auto unreadable = [&] { ASSERT_EQ(symlink("/proc/self/mem", name.c_str()), 0); };
    const size_t before = open_descriptors();
    ASSERT_EQ(boot("stream cp_gnss on 5 3\n"), 0);
    gnss = ctrl->get_cp(CT_GNSS);
    EXPECT_TRUE(log.has("int LogPipeHandler::start_logging(): kestcp: open cp_gnss error [2("));
    // A second start must not lead to a second attempt, nor a stop leave one behind.
    gnss->stop();
    gnss->start();
    gnss->start();
    for (size_t attempts = 1; attempts <= 2; ++attempts) {
        boot_clock::advance(2999);
        pass(1);
        boot_clock::advance(1);
        pass(1);
        EXPECT_EQ(log.count(": kestcp: reopen cp_gnss error [2("), attempts);
    }
    unreadable();
    boot_clock::advance(3000);
    pass(1);
    ASSERT_GE(gnss->fd(), 0);
    // It fails with the next read, which leads to a new open: at once when the path works ...
    ASSERT_EQ(unlink(name.c_str()), 0);
    {
        const Fifo fifo(name);
        ASSERT_TRUE(feed(fifo, "one"));
        ASSERT_EQ(unlink(name.c_str()), 0);
        gnss->stop();
        unreadable();
        gnss->start();
        ASSERT_EQ(unlink(name.c_str()), 0);
    }
    // ... else after a while.
    pass(1);
    EXPECT_EQ(gnss->fd(), -1);
    const Fifo fifo(name);
    boot_clock::advance(3000);
    ASSERT_TRUE(feed(fifo, "two"));
    ctrl.reset();
    EXPECT_EQ(content("cp_gnss"), "onetwo");
    EXPECT_EQ(open_descriptors(), before + 1) << "the FIFO of this test";
}

// A storage that fails, or nothing there to read, changes nothing about the device.
TEST_F(LogPipeHandlerTest, GoesOnAfterAStorageFailure) {
    const Fifo fifo(root.path("gnss"));
    ASSERT_EQ(boot("stream cp_gnss on 5 3\n"), 0);
    gnss = ctrl->get_cp(CT_GNSS);
    ASSERT_EQ(fcntl(gnss->fd(), F_SETFL, O_NONBLOCK | O_APPEND), 0);
    gnss->process(0);
    EXPECT_EQ(root.tree("data"), std::vector<std::string>{});
    remove_tree("data/modem_log");
    root.write_file("data/modem_log", "in the way");
    ASSERT_TRUE(feed(fifo, "lost"));
    EXPECT_EQ(log.count("void LogPipeHandler::process(int): CP cp_gnss save log error ["), 1u);
    remove_tree("data/modem_log");
    ASSERT_TRUE(feed(fifo, "kept"));
    gnss->flush();
    EXPECT_EQ(content("cp_gnss"), "kept");
    EXPECT_TRUE(fcntl(gnss->fd(), F_GETFL) & O_APPEND) << "not opened again";
}

// Both are ready for ever: they took a whole core. The memory has no byte at its start.
TEST_F(LogPipeHandlerTest, DeviceThatGivesNothingIsLeftAlone) {
    boot_clock::freeze();
    const struct {
        const char* device;
        size_t lines;  // of each wake-up
    } cases[] = {{"/dev/null", 1}, {"/proc/self/mem", 0}};
    for (const auto& c : cases) {
        const std::string name = root.path("gnss");
        ASSERT_EQ(symlink(c.device, name.c_str()), 0);
        ASSERT_EQ(boot("stream cp_gnss on 5 3\n"), 0);
        gnss = ctrl->get_cp(CT_GNSS);
        for (size_t wakeups : {10u, 11u}) {
            pass(15);
            EXPECT_EQ(log.count("read returns 0"), wakeups * c.lines);
            boot_clock::advance(3000);
        }
        EXPECT_EQ(log.count("log device of cp_gnss gave nothing 10 times in a row"), 1u);
        // A CP that has come up deserves a fresh start; so does one whose log is switched on.
        gnss->process_alive();
        pass(15);
        EXPECT_EQ(log.count("read returns 0"), 21 * c.lines);
        ASSERT_EQ(unlink(name.c_str()), 0);
        const Fifo fifo(name);
        gnss->stop();
        gnss->start();
        EXPECT_TRUE(feed(fifo, "data")) << c.device;
        EXPECT_EQ(gnss->idle_wakeups(), 0u);
        end_service();
        ASSERT_EQ(unlink(name.c_str()), 0);
    }
}

// No timer can be made then: the device stayed closed for good.
TEST_F(LogPipeHandlerTest, MissingDeviceIsOpenedAtAFlushWhenThereIsNoClock) {
    boot_clock::fail();
    ASSERT_EQ(boot("stream cp_gnss on 5 3\n"), 0);
    EXPECT_TRUE(log.has("int TimerManager::add_timer(unsigned int, "));
    const Fifo fifo(root.path("gnss"));
    ctrl->flush();
    boot_clock::real();
    EXPECT_TRUE(feed(fifo, "data"));
    ctrl->get_cp(CT_GNSS)->process_assert(false);
    ctrl->flush();
    EXPECT_LT(ctrl->get_cp(CT_GNSS)->fd(), 0) << "the CP is down";
}

// ---- CP events

TEST_F(LogPipeHandlerTest, AssertSavesWhatIsWantedAndAliveRecovers) {
    const struct {
        CpType type;
        const char *cp, *device, *reset_prop, *mini_dump;
    } cps[] = {
        {CT_WCDMA, "cp_wcdma", "log_w", "persist.sys.vexa.modemreset", "proc/cpw/mini_dump"},
        {CT_WCN, "cp_wcn", "wcn", "persist.sys.vexa.wcnreset", "proc/cptl/mini_dump"},
        {CT_GNSS, "cp_gnss", "gnss", "persist.sys.vexa.modemreset", "proc/cptl/mini_dump"},
    };
    root.write_file("proc/cpw/mini_dump", pattern_bytes(70000, 1));
    root.write_file("proc/cptl/mini_dump", pattern_bytes(300, 2));
    for (const char* name : {"smsg", "sbuf", "sblock"}) {
        root.write_file(std::string("d/dipx/") + name, name);
    }
    for (const auto& cp : cps) {
        // Bit 0: with a mini dump, bit 1: logging is on. "" counts as 0, "0x1" as 1.
        for (const char* reset : {"1", "0x1", "", "2"}) {
            for (int i = 0; i < 4; ++i) {
                const bool mini_dump = i & 1;
                const bool enabled = i & 2;
                if (cp.type == CT_WCN && enabled) {
                    continue;  // it would begin a dump
                }
                SCOPED_TRACE(std::string(cp.cp) + " reset=" + reset + " " + std::to_string(i));
                root.set_prop(cp.reset_prop, reset);
                const bool resets = strtoul(reset, nullptr, 0) == 1;
                const Fifo fifo(root.path(cp.device));
                ASSERT_EQ(boot(enabled ? ALL_ON : ALL_OFF), 0);
                LogPipeHandler* channel = ctrl->get_cp(cp.type);
                const size_t slots = polled();
                log.clear();
                channel->process_assert(mini_dump);
                channel->process_assert(mini_dump);  // ignored
                EXPECT_EQ(channel->state(), CWS_NOT_WORKING);
                EXPECT_EQ(channel->fd() >= 0, enabled && resets);
                EXPECT_EQ(log.has("Start dump transaction error"), enabled && !resets);
                for (const std::string name : {"smsg", "sbuf", "sblock"}) {
                    EXPECT_EQ(cp_file(cp.cp, name + "_2"), resets ? "(none)" : name);
                }
                EXPECT_TRUE(cp_file(cp.cp, "mini_dump_2") ==
                            (mini_dump ? root.read_file(cp.mini_dump) : "(none)"));
                EXPECT_EQ(root.list(cp_dir(cp.cp)).size(), (resets ? 0u : 3u) + mini_dump);
                for (int alive = 0; alive < 2; ++alive) {
                    channel->process_alive();
                    EXPECT_EQ(channel->state(), CWS_WORKING);
                    EXPECT_EQ(channel->fd() >= 0, enabled);
                    EXPECT_EQ(polled(), slots);
                }
                end_service();
            }
        }
    }
}

// A modem's log files get the time record, and its new directories the version. A storage
// that is first made for the crash material gives every CP's log files the record, and no
// version file.
TEST_F(LogPipeHandlerTest, WhatHeadsALogFileAndItsDirectory) {
    root.set_prop("gsm.version.baseband", "MODEM_1.2|w=3");
    const TimeServer time_service(std::string(REPLY, 12));
    {
        const Fifo modem(root.path("log_w")), gnss_dev(root.path("gnss"));
        ASSERT_EQ(boot(ALL_ON), 0);
        ASSERT_TRUE(feed(modem, "data") && feed(gnss_dev, "data"));
        ctrl->flush();
        EXPECT_EQ(content("cp_wcdma", record) + content("cp_gnss"), "datadata");
        EXPECT_EQ(cp_file("cp_wcdma", "cp_wcdma.version"), "MODEM_1.2|w=3");
        EXPECT_EQ(root.list(cp_dir("cp_gnss")).size(), 1u);
        end_service();
    }
    for (CpType type : {CT_GNSS, CT_WCDMA}) {
        const std::string device = root.path(type == CT_GNSS ? "gnss" : "log_w");
        const Fifo fifo(device);
        ASSERT_EQ(boot(ALL_OFF), 0);
        LogPipeHandler* channel = ctrl->get_cp(type);
        channel->set_log_diag_dev_path(device.c_str());
        channel->process_assert(false);
        EXPECT_EQ(channel->start(), 0);
        channel->process_alive();
        ASSERT_TRUE(feed(fifo, "data"));
        channel->stop();
        EXPECT_EQ(content(channel->name().string(), record), "data");
        EXPECT_EQ(root.list(cp_dir(channel->name().string())).size(), 1u);
        end_service();
    }
}

TEST_F(LogPipeHandlerTest, EventsNeitherLeakNorOpenTwice) {
    const Fifo fifo(root.path("gnss"));
    ASSERT_EQ(boot("stream cp_gnss on 5 3\n"), 0);
    gnss = ctrl->get_cp(CT_GNSS);
    const size_t before = open_descriptors();
    for (int i = 0; i < 200; ++i) {
        root.set_prop("persist.sys.vexa.modemreset", i % 50 ? "1" : "0");
        gnss->process_assert(false);
        if (i % 3 == 0) {
            gnss->stop();
            ASSERT_EQ(polled(), 0u);
            gnss->start();
            ASSERT_EQ(gnss->fd(), -1) << "not before it is alive";
        }
        gnss->process_alive();
        gnss->start();  // it is
        ASSERT_EQ(polled(), 1u);
        ASSERT_TRUE(i % 3 || open_descriptors() == before) << i;
        ASSERT_TRUE(i % 50 || feed(fifo, "x"));
    }
    root.set_prop("persist.sys.vexa.modemreset", "0");
    gnss->process_assert(false);
    EXPECT_EQ(content("cp_gnss"), "xxxx") << "nothing stays staged while the CP is down";
}

}  // namespace
