// SPDX-License-Identifier: Apache-2.0

#include "channels/DiagReplyConsumer.h"

#include "storage/MediaStorage.h"
#include "support/ServiceFixture.h"

namespace {

const struct Kind {
    std::string request;
    std::string file;
    int type;
    const char* timeout;
} KINDS[] = {
    {"SAVE_RINGBUF WCDMA\n", "data:cp_wcdma_ringbuf", 0x3A,
     "static void CpRingBufConsumer::ring_buffer_read_timeout(void*): read ring buffer timeout ["},
    {"SAVE_SLEEP_LOG WCDMA\n", "data:cp_wcdma_sleeplog", 0x3B,
     "static void CpSleepLogConsumer::sleep_log_read_timeout(void*): read sleep log timeout ["},
};

const std::string NONE = "(none)";

class DiagReplyTest : public FaultFixture {
protected:
    // Starts the service with logs and a client that has its place in the loop.
    void begin(bool one_device) {
        boot_modem(one_device);
        ASSERT_TRUE(both_log("<start>"));
        client = std::make_unique<Client>();
        ASSERT_EQ(ask(*client, "FLUSH\n", "OK\n"), "OK\n");
    }
    bool request(const Kind& kind) {
        diag_dev.forget();
        return client->say(kind.request) &&
               pump([&] { return diag_dev.received() == frame(kind.type, 0); });
    }
    // The CP's log goes on over the diag device, once a second.
    void log_for(int seconds) { send_for(seconds, frame(0x98, 'd', "log")); }
    void send_for(int seconds, const std::string& what) {
        for (int i = 0; i < seconds; ++i) {
            EXPECT_TRUE(supply(diag_dev, what));
            run_clock(1000);
        }
    }
    std::string result_file(const Kind& kind) const {
        const Files left = files();
        const auto file = left.find(kind.file + STAMP + ".log");
        return file == left.end() ? NONE : file->second;
    }

    std::unique_ptr<Client> client;
};

TEST_F(DiagReplyTest, AResultThatCannotBeStored) {
    const Kind& kind = KINDS[0];
    const std::string block = frame(kind.type, 'd', std::string(32000, 'x'));
    const std::string end = frame(kind.type, 1);
    const auto delete_it = [&] {
        const std::string dir = "data/modem_log/" + root.list("data/modem_log")[0] + "/cp_wcdma/";
        remove_tree(dir + root.list(dir).back());
    };
    const auto pull_card = [&] {
        set_card(false);
        remove_tree("sd");
        EXPECT_TRUE(feed(gnss_dev, "notices it"));
    };
    const struct {
        const char* what;
        std::function<void()> arrange;
        std::string then;  // comes from the CP, if empty until the time-out
        const char* message;
    } cases[] = {
        // clang-format off
        {"cut", [] { faults::shorten(faults::WRITEV, 64001); }, block, "is not complete [28("},
        {"full at the end", [] { faults::fail(faults::WRITE, 1, ENOSPC); }, end, ": result file of cp_wcdma is not complete [28("},
        {"deleted", delete_it, block, "is gone ["},
        {"deleted, silent", delete_it, "", ""},
        {"deleted, alive", [&] { delete_it(), modem()->process_alive(); }, "", ""},
        {"card pulled", pull_card, block, "is gone ["},
        // clang-format on
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        const bool card = c.what == std::string("card pulled");
        root.make_dir("sd");
        set_card(card);
        ASSERT_NO_FATAL_FAILURE(begin(false));
        const auto before = resources();
        const uint64_t size = ctrl->stor_mgr().get_media_stor()->size();
        ASSERT_TRUE(request(kind));
        ASSERT_TRUE(supply(diag_dev, block + block));
        c.arrange();
        if (c.then.empty()) {
            run_clock(3000);
        } else {
            ASSERT_TRUE(supply(diag_dev, c.then));
        }
        EXPECT_EQ(hear(*client, "ERROR 3\n"), "ERROR 3\n");
        EXPECT_TRUE(log.has(c.message)) << log.text();
        repair();
        EXPECT_EQ(files(), Files{});
        EXPECT_TRUE(card || ctrl->stor_mgr().get_media_stor()->size() == size);
        EXPECT_TRUE(both_log("<again>"));
        EXPECT_EQ(resources(), before);
        end_service();
    }
}

TEST_F(DiagReplyTest, ACpThatIsSilentFailsAndLeavesWhatItSent) {
    ASSERT_NO_FATAL_FAILURE(begin(true));
    for (const Kind& kind : KINDS) {
        log.clear();
        ASSERT_TRUE(request(kind));
        ASSERT_TRUE(supply(diag_dev, frame(kind.type, 'd', "part")));
        // A time-out that comes late, with more data waiting, is none.
        ASSERT_TRUE(diag_dev.put(frame(kind.type, 'd', "s") + "\x7e half a frame"));
        run_clock(3100);
        EXPECT_EQ(diag_dev.pending(), 0u);
        run_clock(2900);
        EXPECT_NE(modem()->state(), CWS_WORKING);
        run_clock(150);
        EXPECT_EQ(hear(*client, "ERROR 3\n"), "ERROR 3\n");
        EXPECT_EQ(result_file(kind), "parts");
        EXPECT_EQ(log.count(kind.timeout), 1u);
    }
    // Without a clock nothing would end an exchange whose end is put off.
    ASSERT_TRUE(request(KINDS[0]));
    ASSERT_TRUE(diag_dev.put("data"));
    mux().timer_mgr().add_timer(
        2999, [](void*) { boot_clock::fail(); }, nullptr);
    run_clock(3000);
    EXPECT_EQ(modem()->state(), CWS_WORKING);
}

// What it had sent before was read at once, and ended the exchange.
TEST_F(DiagReplyTest, AClientThatHangsUpEndsNothing) {
    const Kind& kind = KINDS[0];
    ASSERT_NO_FATAL_FAILURE(begin(false));
    ASSERT_TRUE(request(kind));
    ASSERT_TRUE(client->say("DISABLE_LOG WCDMA\n"));
    Client others[3];
    const auto served = [&](int i) { return ask(others[i], "GET_LOG_STATE WCDMA\n", "OK ON\n"); };
    EXPECT_EQ(served(0) + served(1), "OK ON\nOK ON\n");
    const size_t slots = Filler::free_slots(mux());
    client->hang_up();
    EXPECT_EQ(served(2), "OK ON\n");
    EXPECT_EQ(Filler::free_slots(mux()), slots);
    ASSERT_TRUE(supply(diag_dev, frame(kind.type, 'd', "all") + frame(kind.type, 1)));
    EXPECT_TRUE(pump([&] { return log.has("client disconnected, remaining 3 clients"); }));
    EXPECT_FALSE(modem()->enabled());
    EXPECT_EQ(result_file(kind), "all");
}

TEST_F(DiagReplyTest, ACpThatOnlyLogsFailsThirtySecondsAfterItsLastAnswer) {
    const Kind& kind = KINDS[1];
    ASSERT_NO_FATAL_FAILURE(begin(true));
    ASSERT_TRUE(request(kind));
    log_for(29);
    ASSERT_TRUE(supply(diag_dev, frame(kind.type, 'd', "part")));
    log_for(29);
    run_clock(999);
    EXPECT_EQ(modem()->state(), CWS_SAVE_SLEEP_LOG);
    run_clock(1);
    EXPECT_EQ(hear(*client, "ERROR 3\n"), "ERROR 3\n");
    EXPECT_EQ(result_file(kind), "part");
    EXPECT_EQ(log.count(kind.timeout), 1u);
}

TEST_F(DiagReplyTest, AnAnswerThatNeverEndsIsNone) {
    const Kind& kind = KINDS[0];
    const struct {
        const char* payload;
        int seconds;
    } cases[] = {{"", 30}, {"x", 600}};
    for (const auto& c : cases) {
        ASSERT_NO_FATAL_FAILURE(begin(false));
        ASSERT_TRUE(request(kind));
        send_for(c.seconds - 1, frame(kind.type, 'd', c.payload));
        EXPECT_EQ(modem()->state(), CWS_SAVE_RINGBUF);
        run_clock(1000);
        EXPECT_EQ(hear(*client, "ERROR 3\n"), "ERROR 3\n") << c.seconds;
        end_service();
    }
}

}  // namespace
