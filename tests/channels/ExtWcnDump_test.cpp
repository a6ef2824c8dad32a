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

TEST_F(ExtWcnDumpTest, TheMarkerEndsTheDumpInAShortChunkOnly) {
    const struct {
        const char* what;
        std::vector<std::string> chunks;  // followed by the marker alone, if not ended
        size_t stored;                    // chunks in the file
        bool ended;
    } cases[] = {
        {"alone", {MARKER}, 0, true},
        {"at the start of 4095 bytes", {memory(9000), MARKER + memory(4074)}, 1, true},
        {"at the very end", {memory(32768), memory(4074) + MARKER}, 1, true},
        {"in 4096 bytes", {memory(2000) + MARKER + memory(2075), memory(1)}, 2, false},
        {"split", {memory(50) + MARKER.substr(0, 20), MARKER.substr(20) + memory(30)}, 2, false},
        {"nearly", {MARKER.substr(1), MARKER.substr(0, 20) + "H", "\n" + memory(4094)}, 3, false},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        boot_wcn();
        begin();
        std::string stored;
        for (size_t i = 0; i < c.chunks.size(); ++i) {
            ASSERT_EQ(wcn()->state(), CWS_DUMP) << i;
            ASSERT_TRUE(feed(wcn_dev, c.chunks[i]));
            stored += i < c.stored ? c.chunks[i] : "";
        }
        ASSERT_EQ(wcn()->state() != CWS_DUMP, c.ended);
        ASSERT_TRUE(c.ended || feed(wcn_dev, MARKER));
        EXPECT_TRUE(files("cp_wcn") == dump("data", stored));
        expect_over();
        end_service();
    }
}

TEST_F(ExtWcnDumpTest, ADumpThatCannotBeStored) {
    boot_wcn();
    const size_t before = lasting_descriptors();
    const auto remove = [&] {
        remove_tree("data/modem_log/" + root.list("data/modem_log").back() + "/cp_wcn");
    };
    const std::string not_complete = ": dump of cp_wcn is not complete ";
    const struct {
        const char* what;
        std::function<void()> arrange;
        std::string then;  // comes from the chip
        std::string message;
    } cases[] = {
        {"cut", [] { faults::shorten(faults::WRITEV, 60001); }, memory(30000), ""},
        {"removed", remove, memory(30000), ""},
        {"removed before the end", remove, MARKER, not_complete + "[2("},
        // What is still staged then; the first write is that of this test.
        {"full at the end", [] { faults::fail(faults::WRITE, 2, ENOSPC); }, MARKER,
         not_complete + "[28("},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        begin();
        ASSERT_TRUE(feed(wcn_dev, memory(30000)));
        ASSERT_TRUE(feed(wcn_dev, memory(30000)));
        c.arrange();
        ASSERT_TRUE(feed(wcn_dev, c.then));
        EXPECT_TRUE(log.has(c.message)) << log.text();
        EXPECT_TRUE(c.then == MARKER || files("cp_wcn").empty());
        expect_over();
    }
    EXPECT_EQ(lasting_descriptors(), before + 1) << "the log file";
    // No file at all.
    faults::fail(faults::OPEN, 1, EACCES, 100);
    wcn()->process_assert(false);
    repair();
    EXPECT_TRUE(log.has("ExtWcnDumpConsumer::start(): open dump file failed! [13("));
    EXPECT_EQ(hear(*subscriber, START + END), START + END);
    EXPECT_EQ(wcn()->fd(), -1);
}

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
