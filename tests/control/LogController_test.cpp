// SPDX-License-Identifier: Apache-2.0

#include "control/LogController.h"

#include "channels/AgDspLogHandler.h"
#include "channels/ExtWcnLogHandler.h"
#include "channels/GnssCpLogHandler.h"
#include "channels/WanModemLogHandler.h"
#include "storage/CpStorage.h"
#include "support/ServiceFixture.h"

namespace {

class LogControllerTest : public ChannelFixture {};

TEST_F(LogControllerTest, MakesTheChannelOfEachType) {
    ASSERT_EQ(boot("stream agdsp off 5 3\nstream cp_gnss on 5 3\nstream cp_wcdma on 5 3\n"
                   "stream cp_wcn off 5 3\n"),
              0);
    ASSERT_EQ(ctrl->log_pipes().size(), 4u);
    EXPECT_TRUE(dynamic_cast<AgDspLogHandler*>(ctrl->get_cp(CT_AGDSP)));
    EXPECT_TRUE(dynamic_cast<GnssCpLogHandler*>(ctrl->get_cp(CT_GNSS)));
    EXPECT_TRUE(dynamic_cast<WanModemLogHandler*>(ctrl->get_cp(CT_WCDMA)));
    EXPECT_TRUE(dynamic_cast<ExtWcnLogHandler*>(ctrl->get_cp(CT_WCN)));
    EXPECT_TRUE(ctrl->get_cp(CT_WCDMA)->enabled());
    EXPECT_FALSE(ctrl->get_cp(CT_WCN)->enabled());
    EXPECT_EQ(ctrl->get_cp(CT_TD), nullptr);
    const std::string where =
        "LogPipeHandler* LogController::create_handler(const LogConfig::ConfigEntry*): ";
    EXPECT_TRUE(log.has(where + "CP cp_wcdma dev " + root.path("log_w") + " " +
                        root.path("diag_w") + "\n"));
    EXPECT_TRUE(log.has(where + "CP cp_gnss dev " + root.path("gnss") + "\n"));
    EXPECT_EQ(log.count(where), 2u) << "nothing else";
}

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
