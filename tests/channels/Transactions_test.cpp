// SPDX-License-Identifier: Apache-2.0
// What comes between a transaction and its end.
#include "support/ServiceFixture.h"

namespace {

struct Transaction {
    bool dump;
    std::string request;  // of a client, for all but a dump
    const char* file;
    const char* no_file;  // message
};
const Transaction DUMP = {true, "", "_memory_", "open_dump_file(): open dump file cp_wcdma_memory"};
const Transaction RINGBUF = {
    false, "SAVE_RINGBUF WCDMA\n", "_ringbuf_",
    "LogFile* CpRingBufConsumer::open_file(): open ring buffer file cp_wcdma_ringbuf"};
const Transaction SLEEP_LOG = {
    false, "SAVE_SLEEP_LOG WCDMA\n", "_sleeplog_",
    "LogFile* CpSleepLogConsumer::open_file(): open sleep log file cp_wcdma_sleeplog"};

class TransactionsTest : public FaultFixture {
protected:
    TransactionsTest() { faults::set_time(0); }
};

TEST_F(TransactionsTest, OneThatCannotStartLeavesNothingBehind) {
    const struct {
        const char* what;
        std::function<void()> arrange;
        bool no_file, unheard;  // the CP hears nothing
    } cases[] = {
        {"no diag device", [&] { modem()->set_dev_paths(own_log_dev.path().c_str(), "/nowhere"); },
         false, true},
        {"no file", [] { faults::fail(faults::OPEN, 1, EROFS); }, true, false},
        {"request cut", [] { faults::shorten(faults::WRITE, 1); }, false, false},
        {"no clock", [] { boot_clock::fail(); }, false, true},
    };
    for (const Transaction& transaction : {DUMP, RINGBUF, SLEEP_LOG}) {
        for (const auto& c : cases) {
            SCOPED_TRACE(std::string(c.what) + " for " + transaction.file);
            boot_modem(false);
            ASSERT_TRUE(both_log("<start>"));
            Client client;
            ASSERT_EQ(ask(client, "FLUSH\n", "OK\n"), "OK\n");
            const auto before = resources();
            faults::only_on(transaction.file);
            c.arrange();
            if (transaction.dump) {
                modem()->process_assert(false);
                EXPECT_EQ(modem()->state(), CWS_NOT_WORKING);
                EXPECT_TRUE(log.has("process_assert(bool): Start dump transaction error ["));
            } else {
                EXPECT_EQ(ask(client, transaction.request, "ERROR 3\n"), "ERROR 3\n");
                EXPECT_EQ(modem()->state(), CWS_WORKING);
            }
            repair();
            EXPECT_EQ(log.has(transaction.no_file), c.no_file);
            EXPECT_EQ(files(), Files{}) << "no copy of the memory either";
            modem()->process_alive();
            EXPECT_TRUE(both_log("<again>"));
            EXPECT_TRUE(!c.unheard || diag_dev.received().empty());
            EXPECT_EQ(resources(), before);
            end_service();
        }
    }
}

// Hung up, or readable for ever without data.
TEST_F(TransactionsTest, ADeviceThatGivesNothingEndsItsTransactionAfterOneTimeout) {
    root.write_file("empty", "");
    for (bool dump : {true, false}) {
        auto pty = std::make_unique<Pty>();
        for (const std::string& path :
             {root.path("empty"), std::string("/dev/null"), pty->path()}) {
            SCOPED_TRACE(path);
            boot_modem(false);
            modem()->set_dev_paths(own_log_dev.path().c_str(), path.c_str());
            dump ? modem()->process_assert(false) : (void)modem()->save_ringbuf(nullptr);
            if (path == pty->path()) {
                pty.reset();
            }
            ASSERT_TRUE(pump([&] { return log.has(" gave nothing "); }));
            run_clock(2999);
            EXPECT_GT(modem()->state(), CWS_WORKING);
            run_clock(1);
            EXPECT_EQ(modem()->state(), dump ? CWS_NOT_WORKING : CWS_WORKING);
            EXPECT_EQ(root.find(".mem").size() - root.find(".dmp").size(), dump ? 1u : 0u);
            EXPECT_EQ(log.count("unexpected event") + log.count(" return 0 ["), 1u);
            end_service();
        }
    }
}

// The log device makes room for a diag handler on the same device. On one of its own the
// exchange begins, and what comes is read once there is room.
TEST_F(TransactionsTest, ALoopWithoutRoomServesTransactions) {
    for (bool one_device : {true, false}) {
        boot_modem(one_device);
        Client client;
        EXPECT_EQ(ask(client, "FLUSH\n", "OK\n"), "OK\n");
        auto fillers = Filler::fill(mux());
        if (one_device) {  // somebody who waits does not come between
            fillers.push_back(std::make_unique<Filler>(&mux()));
            fillers.back()->poll_when_room(POLLIN, "another");
        }
        faults::fail(faults::WRITE, 1, EIO);
        EXPECT_EQ(ask(client, RINGBUF.request, "ERROR 3\n"), "ERROR 3\n");
        EXPECT_TRUE(both_log("<again>"));
        ASSERT_TRUE(begin_dump());
        ASSERT_TRUE(diag_dev.put(end_marker()));
        if (!one_device) {
            pump_once(mux());
            EXPECT_EQ(modem()->state(), CWS_DUMP);
            fillers.pop_back();
        }
        EXPECT_TRUE(pump([&] { return modem()->state() == CWS_NOT_WORKING; }));
        EXPECT_EQ(log.count("no room to poll " + diag_dev.path()), one_device ? 0u : 2u);
        fillers.clear();
        end_service();
    }
}

}  // namespace
