// SPDX-License-Identifier: Apache-2.0
// The memory dump of the connectivity chip. A FIFO hands over exactly the chunks put in.
#include "support/ServiceFixture.h"

namespace {

const std::string MARKER = "corbet_memdump_finish";
const std::string START = "CP_DUMP_START WCN\n";
const std::string END = "CP_DUMP_END WCN\n";

std::string memory(size_t len) {
    return pattern_bytes(len, static_cast<uint32_t>(len));
}

class ExtWcnDumpTest : public FaultFixture {
protected:
    void boot_wcn() {
        ASSERT_EQ(boot("stream cp_wcn on 5 3\nstream cp_gnss on 5 3\n"), 0);
        subscriber = std::make_unique<Client>();
        ASSERT_EQ(ask(*subscriber, "SUBSCRIBE WCN DUMP\n", "OK\n"), "OK\n");
    }
    LogPipeHandler* wcn() const { return ctrl->get_cp(CT_WCN); }
    void begin() {
        wcn()->process_assert(false);
        EXPECT_EQ(hear(*subscriber, START), START);
        ASSERT_EQ(wcn()->state(), CWS_DUMP);
    }
    // The dump is over: told once, the device closed, the chip not working until alive.
    void expect_over() {
        EXPECT_EQ(hear(*subscriber, END), END);
        EXPECT_EQ(wcn()->state(), CWS_NOT_WORKING);
        EXPECT_EQ(wcn()->fd(), -1);
        wcn()->process_alive();
        ASSERT_TRUE(feed(wcn_dev, "alive"));
        wcn()->flush();
        EXPECT_GT(logged("cp_wcn", "alive"), 0u);
    }
    // Where the dump lies and what it holds.
    static Files dump(const std::string& medium, const std::string& content) {
        return {{medium + ":cp_wcn_memory" + STAMP + ".dmp", content}};
    }

    const Fifo wcn_dev{root.path("wcn")};
    std::unique_ptr<Client> subscriber;
};

TEST_F(ExtWcnDumpTest, TheCardIsPulledOrTheChipAliveDuringADump) {
    set_card(true);
    boot_wcn();
    begin();
    set_card(false);
    ASSERT_TRUE(feed(wcn_dev, memory(32768))) << "nobody has noticed yet";
    EXPECT_EQ(wcn()->state(), CWS_DUMP);
    ASSERT_TRUE(feed(gnss_dev, "notices"));
    expect_over();
    EXPECT_TRUE(log.has("SD card is gone, the dump of cp_wcn ends"));
    EXPECT_TRUE(files("cp_wcn") == dump("sd", memory(32768)));
    // The next one goes to the internal medium; the card may come and go.
    remove_tree("sd/modem_log");
    begin();
    for (bool card : {true, false}) {
        set_card(card);
        ASSERT_TRUE(feed(gnss_dev, "on either"));
        EXPECT_EQ(wcn()->state(), CWS_DUMP);
    }
    ASSERT_TRUE(feed(wcn_dev, memory(5000)));
    wcn()->process_alive();
    EXPECT_EQ(hear(*subscriber, END), END);
    EXPECT_TRUE(files("cp_wcn") == dump("data", memory(5000)));
    ASSERT_TRUE(feed(wcn_dev, MARKER));
    wcn()->flush();
    EXPECT_EQ(logged("cp_wcn", MARKER), 1u) << "log data now";
}

}  // namespace
