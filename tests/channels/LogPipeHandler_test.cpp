// SPDX-License-Identifier: Apache-2.0

#include "channels/LogPipeHandler.h"

#include "support/ServiceFixture.h"
#include "support/faults.h"

namespace {

class LogPipeHandlerTest : public CrashFixture {
protected:
    LogPipeHandlerTest() {
        set_zone("UTC0");
        remove_tree("gnss");  // each test has a device of its own there, or none
    }

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

// A modem's log files get the time record, and its new directories the version. A storage
// that is first made for the crash material gives every CP's log files the record, and no
// version file.
TEST_F(LogPipeHandlerTest, WhatHeadsALogFileAndItsDirectory) {
    root.set_prop("gsm.version.baseband", "MODEM_1.2|w=3");
    const std::string record = "\x78\x56\x34\x12tttttttttttt";
    const Fifo modem_dev(root.path("log_w")), fifo(root.path("gnss"));
    ASSERT_EQ(boot("stream cp_wcdma on 5 3\nstream cp_gnss on 5 3\n"), 0);
    ASSERT_TRUE(feed(modem_dev, "modem") && feed(fifo, "gnss"));
    ctrl->flush();
    EXPECT_EQ(content("cp_wcdma", record), "modem");
    EXPECT_EQ(content("cp_gnss"), "gnss");
    EXPECT_EQ(files("cp_wcdma"), (Files{{"data:cp_wcdma.version", "MODEM_1.2|w=3"}}));
    EXPECT_EQ(files("cp_gnss"), Files{});
    end_service();

    ASSERT_EQ(boot("stream cp_gnss off 5 3\n"), 0);
    gnss = ctrl->get_cp(CT_GNSS);
    gnss->set_log_diag_dev_path(root.path("gnss").c_str());
    gnss->process_assert(false);
    EXPECT_EQ(gnss->start(), 0);
    gnss->process_alive();
    ASSERT_TRUE(feed(fifo, "data"));
    gnss->stop();
    EXPECT_EQ(content("cp_gnss", record), "data");
    EXPECT_EQ(files("cp_gnss"), Files{});
}

TEST_F(LogPipeHandlerTest, OpensOnceWhenTheCpIsAlive) {
    const Fifo fifo(root.path("gnss"));
    ASSERT_EQ(boot("stream cp_gnss on 5 3\n"), 0);
    gnss = ctrl->get_cp(CT_GNSS);
    gnss->process_assert(false);
    gnss->stop();
    gnss->start();
    EXPECT_EQ(gnss->fd(), -1) << "not before it is alive";
    gnss->process_alive();
    const int device = gnss->fd();
    gnss->process_alive();
    EXPECT_EQ(gnss->fd(), device) << "not opened twice";
    ASSERT_TRUE(feed(fifo, "x"));
    gnss->process_assert(false);
    EXPECT_EQ(content("cp_gnss"), "x") << "nothing stays staged while the CP is down";
}

}  // namespace
