// SPDX-License-Identifier: Apache-2.0

#include "control/LogController.h"

#include "storage/CpStorage.h"
#include "support/ServiceFixture.h"

namespace {

typedef ChannelFixture LogControllerTest;

TEST_F(LogControllerTest, ChannelWithoutDevicesWaitsToBeStarted) {
    const Fifo fifo(root.path("td"));
    ASSERT_EQ(boot("stream cp_td-scdma on 5 3\nstream cp_gnss off 5 3\n"), 0);
    EXPECT_TRUE(log.has(": Can not get log/diag path for cp_td-scdma ["));
    LogPipeHandler* td = ctrl->get_cp(CT_TD);
    ASSERT_NE(td, nullptr);
    EXPECT_FALSE(td->enabled());
    EXPECT_EQ(polled(), 0u);
    td->set_dev_paths(root.path("td").c_str(), root.path("diag").c_str());
    EXPECT_EQ(td->start(), 0);
    EXPECT_EQ(polled(), 1u);
}

TEST_F(LogControllerTest, NoSpaceForAMiniDump) {
    const Fifo fifo(root.path("gnss"));
    root.write_file("proc/cptl/mini_dump", "mini");
    root.write_file("data/modem_log/2016-03-01-09-15-00/cp_gnss/a.bin", std::string(1 << 21, 'x'));
    ASSERT_EQ(boot("data_log_size 1\nlog_overwrite disable\nstream cp_gnss on 5 3\n"), 0);
    ASSERT_TRUE(feed(fifo, "data"));  // makes the set and so counts what there is
    struct tm t = {};
    EXPECT_EQ(ctrl->save_mini_dump(ctrl->get_cp(CT_GNSS)->storage(), t, CT_GNSS), -1);
    EXPECT_TRUE(log.has(": no space for mini dump ["));
    EXPECT_EQ(root.tree("data/modem_log").size(), 2u);
}

}  // namespace
