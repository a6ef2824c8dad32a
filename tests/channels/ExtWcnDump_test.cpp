// SPDX-License-Identifier: Apache-2.0
// The memory dump of the connectivity chip when its card is pulled. What comes of it and of other
// ends is in tests/recordings: wcn_crash.in, wcn_dump_card.in.
#include "support/ServiceFixture.h"

namespace {

class ExtWcnDumpTest : public FaultFixture {};

TEST_F(ExtWcnDumpTest, ItEndsWhenTheServiceNoticesThatItsCardIsPulled) {
    const Fifo wcn_dev(root.path("wcn"));
    set_card(true);
    ASSERT_EQ(boot("stream cp_wcn on 5 3\nstream cp_gnss on 5 3\n"), 0);
    LogPipeHandler* wcn = ctrl->get_cp(CT_WCN);
    wcn->process_assert(false);
    set_card(false);
    ASSERT_TRUE(feed(wcn_dev, "nobody has noticed yet"));
    EXPECT_EQ(wcn->state(), CWS_DUMP);
    ASSERT_TRUE(feed(gnss_dev, "notices"));
    EXPECT_TRUE(log.has("SD card is gone, the dump of cp_wcn ends"));
    EXPECT_EQ(wcn->state(), CWS_NOT_WORKING);
    EXPECT_EQ(wcn->fd(), -1);
}

}  // namespace
