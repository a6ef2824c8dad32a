#include "channels/DiagReplyConsumer.h"

#include "channels/FaultFixture.h"
#include "storage/MediaStorage.h"

namespace {

const struct Kind {
    std::string request;
    std::string file;
    int type;
    const char* not_served;
    const char* open_failure;
    const char* timeout;
} KINDS[] = {
    {"SAVE_RINGBUF WCDMA\n", "data:cp_wcdma_ringbuf", 0x3A, "ERROR 7\n",
     "): LogFile* CpRingBufConsumer::open_file(): open ring buffer file ",
     "static void CpRingBufConsumer::ring_buffer_read_timeout(void*): read ring buffer timeout ["},
    {"SAVE_SLEEP_LOG WCDMA\n", "data:cp_wcdma_sleeplog", 0x3B, "ERROR 6\n",
     "): LogFile* CpSleepLogConsumer::open_file(): open sleep log file ",
     "static void CpSleepLogConsumer::sleep_log_read_timeout(void*): read sleep log timeout ["},
};

class DiagReplyTest : public FaultFixture {
protected:
    bool request(const Kind& kind, Client& client) {
        diag_dev.forget();
        return client.say(kind.request) &&
               pump([&] { return diag_dev.received() == frame(kind.type, 0); });
    }
};

TEST_F(DiagReplyTest, EveryAnswerOfTheCp) {
    for (const Kind& kind : KINDS) {
        const std::string data = pattern_bytes(20000, 5) + "\x7e\x7d\x7e";
        const auto reply = [&](int sub_type, const std::string& payload = "") {
            return frame(kind.type, sub_type, payload);
        };
        const std::string other = frame(kind.type ^ 1, 1) + frame(kind.type ^ 1, 'd', "no") +
                                  frame(0x98, 0x64, "log") + raw_frame("short") + "noise";
        const struct {
            std::string bytes;
            std::string result;
            std::string file;  // "-": none
        } cases[] = {
            {reply('d', data) + reply('d') + reply('d', data) + reply(1), "OK\n", data + data},
            {reply(1), "OK\n", ""},
            {reply('d', "x") + reply(1, "ignored") + reply('d', "late"), "OK\n", "x"},
            {other + reply('d', "a") + other + reply('d', "b") + other + reply(1), "OK\n", "ab"},
            {reply(0), kind.not_served, "-"},
            {reply('d', "a") + reply(0, "why"), kind.not_served, "-"},
            {reply('d', "a") + reply(2), "ERROR 3\n", "-"},
            {reply('e', "a"), "ERROR 3\n", "-"},
        };
        for (bool one_device : {false, true}) {
            boot_modem(one_device);
            ASSERT_TRUE(both_log("<start>"));
            Client client;
            Client other_client;
            ASSERT_EQ(ask(client, "FLUSH\n", "OK\n"), "OK\n");
            ASSERT_EQ(ask(other_client, "FLUSH\n", "OK\n"), "OK\n");
            const auto before = resources();
            for (const auto& c : cases) {
                SCOPED_TRACE(kind.request + std::to_string(&c - cases));
                ASSERT_TRUE(request(kind, client));
                EXPECT_NE(modem()->state(), CWS_WORKING);
                EXPECT_EQ(ask(other_client, kind.request, "ERROR 4\n"), "ERROR 4\n");
                ASSERT_TRUE(supply(diag_dev, c.bytes));
                EXPECT_EQ(hear(client, c.result), c.result);
                EXPECT_EQ(modem()->state(), CWS_WORKING);
                const Files left = files();
                const auto file = left.find(kind.file + STAMP + ".log");
                EXPECT_TRUE((file == left.end() ? "-" : file->second) == c.file);
            }
            EXPECT_EQ(resources(), before);
            EXPECT_TRUE(both_log("<end>"));
            end_service();
        }
    }
}

TEST_F(DiagReplyTest, FaultsOfTheStorageAndTheDevice) {
    const std::string set = "data/modem_log/";
    const struct {
        const char* what;
        bool at_start;
        std::function<void()> arrange;
        const char* message;
    } cases[] = {
        {"no diag device", true,
         [&] { modem()->set_dev_paths(own_log_dev.path().c_str(), "/nowhere"); }, ""},
        {"no file", true, [] { faults::fail(faults::OPEN, 1, EROFS); }, ".log failed [30("},
        {"no request", true, [] { faults::fail(faults::WRITE, 1, EAGAIN); }, ""},
        {"request cut", true, [] { faults::shorten(faults::WRITE, 9); }, ""},
        {"full", false, [] { faults::fail(faults::WRITEV, 1, ENOSPC); }, ""},
        {"cut", false, [] { faults::shorten(faults::WRITEV, 64001); }, ""},
        {"full at the end", false, [] { faults::fail(faults::WRITE, 1, ENOSPC); },
         ": result file of cp_wcdma is not complete [28("},
        {"deleted", false,
         [&] {
             const std::string dir = set + root.list(set)[0] + "/cp_wcdma/";
             remove_tree(dir + root.list(dir).back());
         },
         "is gone ["},
        {"gone", false, [&] { remove_tree(set + root.list(set)[0] + "/cp_wcdma"); }, "is gone ["},
        {"set gone", false, [&] { remove_tree(set + root.list(set)[0]); }, "is gone ["},
        {"card pulled", false,
         [&] {
             set_card(false);
             remove_tree("sd");
             EXPECT_TRUE(feed(gnss_dev, "notices it"));
         },
         "is gone ["},
    };
    for (const Kind& kind : KINDS) {
        for (const auto& c : cases) {
            SCOPED_TRACE(kind.request + c.what);
            root.make_dir("sd");
            set_card(c.what == std::string("card pulled"));
            boot_modem(false);
            ASSERT_TRUE(both_log("<start>"));
            Client client;
            ASSERT_EQ(ask(client, "FLUSH\n", "OK\n"), "OK\n");
            const auto before = resources();
            const uint64_t size = ctrl->stor_mgr().get_media_stor()->size();
            if (c.at_start) {
                c.arrange();
                ASSERT_EQ(ask(client, kind.request, "ERROR 3\n"), "ERROR 3\n");
                EXPECT_EQ(log.has(kind.open_failure), *c.message != '\0');
            } else {
                const bool end = c.what == std::string("full at the end");
                ASSERT_TRUE(request(kind, client));
                ASSERT_TRUE(supply(diag_dev, frame(kind.type, 'd', std::string(32000, 'x')) +
                                                 frame(kind.type, 'd', std::string(32000, 'x'))));
                c.arrange();
                const std::string more = frame(kind.type, 'd', std::string(3000, 'x'));
                ASSERT_TRUE(supply(diag_dev, end ? frame(kind.type, 1) : more));
                ASSERT_EQ(hear(client, "ERROR 3\n"), "ERROR 3\n");
            }
            EXPECT_TRUE(log.has(c.message)) << log.text();
            repair();
            EXPECT_EQ(files(), Files{});
            if (logged("cp_wcdma", "<start>")) {
                EXPECT_EQ(ctrl->stor_mgr().get_media_stor()->size(), size);
            }
            EXPECT_EQ(modem()->state(), CWS_WORKING);
            EXPECT_TRUE(both_log("<again>"));
            EXPECT_EQ(resources(), before);
            end_service();
        }
    }
}

TEST_F(DiagReplyTest, ACpThatIsSilentOrOnlyLogsFailsAndLeavesWhatItSent) {
    boot_modem(true);
    Client client;
    const auto log_for = [&](int seconds) {
        for (int i = 0; i < seconds; ++i) {
            EXPECT_TRUE(supply(diag_dev, frame(0x98, 'd', "log")));
            run_clock(1000);
        }
    };
    for (int i = 0; i < 4; ++i) {
        const Kind& kind = KINDS[i / 2];
        const bool logs = i % 2;
        ASSERT_TRUE(request(kind, client));
        log_for(logs ? 29 : 0);
        ASSERT_TRUE(supply(diag_dev, frame(kind.type, 'd', "part")));
        log_for(logs ? 29 : 0);
        // A time-out that comes late, with more data waiting, is none.
        ASSERT_TRUE(logs || diag_dev.put(frame(kind.type, 'd', "s") + "\x7e half a frame"));
        run_clock(logs ? 999 : 3100);
        EXPECT_EQ(diag_dev.unread(), 0u);
        run_clock(logs ? 0 : 2900);
        EXPECT_NE(modem()->state(), CWS_WORKING);
        EXPECT_FALSE(log.has("timeout"));
        run_clock(logs ? 1 : 150);
        ASSERT_EQ(hear(client, "ERROR 3\n"), "ERROR 3\n");
        EXPECT_EQ(files()[kind.file + STAMP + ".log"], logs ? "part" : "parts");
        EXPECT_TRUE(log.has(kind.timeout));
        log.clear();
    }
    // Without a clock nothing would end an exchange that begins, or whose end is put off.
    diag_dev.forget();
    const size_t left = files().size();
    boot_clock::fail();
    EXPECT_EQ(modem()->save_ringbuf(nullptr), -1);
    repair();
    EXPECT_EQ(diag_dev.received(), "");
    EXPECT_EQ(files().size(), left);
    ASSERT_TRUE(request(KINDS[0], client));
    ASSERT_TRUE(diag_dev.put("data"));
    mux().timer_mgr().add_timer(
        2999, [](void*) { boot_clock::fail(); }, nullptr);
    run_clock(3000);
    EXPECT_EQ(modem()->state(), CWS_WORKING);
    repair();
    EXPECT_EQ(hear(client, "ERROR 3\n"), "ERROR 3\n");
    diag_dev.forget();
    EXPECT_TRUE(both_log("<again>"));
}

}  // namespace
