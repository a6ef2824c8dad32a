// SPDX-License-Identifier: Apache-2.0

#include "channels/LogPipeHandler.h"

#include "support/ServiceFixture.h"

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

// A CP that the handset resets keeps its device open; a driver that had hung it up gave nothing
// any more until the log was switched off and on.
TEST_F(LogPipeHandlerTest, ADeviceThatHungUpIsOpenedAnew) {
    const std::string name = root.path("gnss");
    const auto connect = [&] {
        auto device = std::make_unique<Pty>();
        unlink(name.c_str());
        EXPECT_EQ(symlink(device->path().c_str(), name.c_str()), 0);
        return device;
    };
    auto device = connect();
    ASSERT_EQ(boot("stream cp_gnss on 5 3\n"), 0);
    gnss = ctrl->get_cp(CT_GNSS);
    ASSERT_TRUE(supply(*device, "one"));
    const size_t descriptors = open_descriptors();
    gnss->process_alive();
    EXPECT_TRUE(supply(*device, "two")) << "kept: it works";
    device.reset();
    ASSERT_TRUE(pump([&] { return log.has("read returns 0"); }));
    device = connect();
    gnss->process_alive();
    EXPECT_TRUE(supply(*device, "three"));
    // Nobody tells that some CPs are alive.
    boot_clock::freeze();
    device.reset();
    ASSERT_TRUE(pump([&] { return log.has("gave nothing 10 times in a row"); }));
    device = connect();
    boot_clock::advance(3000);
    EXPECT_TRUE(supply(*device, "four"));
    EXPECT_EQ(open_descriptors(), descriptors);
    ctrl.reset();
    EXPECT_EQ(content("cp_gnss"), "onetwothreefour");
}

// A file in the place of the device was logged again with each rest, until the quota was full of
// it.
TEST_F(LogPipeHandlerTest, AFileIsReadOnce) {
    boot_clock::freeze();
    root.write_file("gnss", "one");
    ASSERT_EQ(boot("stream cp_gnss on 5 3\n"), 0);
    gnss = ctrl->get_cp(CT_GNSS);
    for (int i = 0; i < 3; ++i) {
        pass(15);
        gnss->process_alive();
        boot_clock::advance(3000);
    }
    root.write_file("gnss", "onetwo");
    pass(15);
    // Another file, or a device, is opened all the same.
    unlink(root.path("gnss").c_str());
    root.write_file("gnss", "three");
    for (int i = 0; i < 2; ++i) {
        boot_clock::advance(3000);
        pass(15);
    }
    ctrl.reset();
    EXPECT_EQ(content("cp_gnss"), "onetwothree");
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
    // The time service has all the time that it needs.
    faults::instead.poll = [](struct pollfd* fds, nfds_t num, int timeout) {
        return real::poll(fds, num, num == 1 && timeout > 0 ? -1 : timeout);
    };
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
    faults::instead.poll = nullptr;
}

}  // namespace
