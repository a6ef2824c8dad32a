// What comes between a transaction and its end.
#include "channels/FaultFixture.h"

namespace {

enum Transaction { DUMP, RINGBUF, SLEEP_LOG };
const char* const REQUESTS[] = {"dump", "SAVE_RINGBUF WCDMA\n", "SAVE_SLEEP_LOG WCDMA\n"};
const std::string START = "CP_DUMP_START WCDMA\n";
const std::string END = "CP_DUMP_END WCDMA\n";

class TransactionsTest : public FaultFixture {
protected:
    TransactionsTest() { faults::set_time(0); }

    bool begin(Transaction transaction, Client& client) {
        if (transaction == DUMP) {
            return begin_dump();
        }
        diag_dev.forget();
        return client.say(REQUESTS[transaction]) &&
               pump([&] { return diag_dev.received().size() == 10; });
    }
    size_t count_files(const std::string& part) const {
        size_t n = 0;
        for (const auto& file : files()) {
            n += file.first.find(part) != std::string::npos;
        }
        return n;
    }
};

TEST_F(TransactionsTest, WhateverComesBetweenEveryoneIsAnsweredAndTheChannelLogsAgain) {
    const auto reset = [&](const char* value) {
        root.set_prop("persist.sys.vexa.modemreset", value);
    };
    const struct {
        const char* what;
        std::function<void()> interrupt;
        CpWorkState dump_state;    // afterwards, when a dump runs
        CpWorkState client_state;  // when a client's transaction runs
        const char* dump_lines;    // what the subscriber hears then in all
        const char* client_lines;
    } cases[] = {
        {"stop", [&] { modem()->stop(); }, CWS_NOT_WORKING, CWS_WORKING, "SE", ""},
        {"assert", [&] { modem()->process_assert(false); }, CWS_DUMP, CWS_DUMP, "S", "S"},
        {"assert of a CP that is reset",
         [&] { reset("1"), modem()->process_assert(false), reset(""); }, CWS_DUMP, CWS_NOT_WORKING,
         "S", ""},
        {"alive", [&] { modem()->process_alive(); }, CWS_WORKING, CWS_WORKING, "SE", ""},
        {"alive without a device",
         [&] {
             modem()->set_dev_paths("/nowhere", diag_dev.path().c_str());
             modem()->process_alive();
             modem()->set_dev_paths(log_dev->path().c_str(), diag_dev.path().c_str());
         },
         CWS_WORKING, CWS_WORKING, "SE", ""},
        {"assert and alive", [&] { modem()->process_assert(false), modem()->process_alive(); },
         CWS_WORKING, CWS_WORKING, "SE", "SE"},
        {"stop and start", [&] { modem()->stop(), modem()->start(); }, CWS_NOT_WORKING, CWS_WORKING,
         "SE", ""},
    };
    for (int i = 0; i < 6; ++i) {
        const bool one_device = i >= 3;
        const Transaction transaction = static_cast<Transaction>(i % 3);
        for (const auto& c : cases) {
            if (one_device && std::string(c.what) == "alive without a device") {
                continue;
            }
            SCOPED_TRACE(std::string(c.what) + " " + REQUESTS[transaction]);
            boot_modem(one_device);
            ASSERT_TRUE(both_log("<start>"));
            Client client;
            Client subscriber;
            ASSERT_EQ(ask(subscriber, "SUBSCRIBE WCDMA DUMP\n", "OK\n"), "OK\n");
            ASSERT_EQ(ask(client, "FLUSH\n", "OK\n"), "OK\n");
            const auto before = resources();
            ASSERT_TRUE(begin(transaction, client));
            c.interrupt();
            EXPECT_EQ(modem()->state(), transaction == DUMP ? c.dump_state : c.client_state);
            std::string lines;
            for (const char* l = transaction == DUMP ? c.dump_lines : c.client_lines; *l; ++l) {
                lines += *l == 'S' ? START : END;
            }
            EXPECT_EQ(hear(subscriber, lines), lines);
            if (transaction != DUMP) {
                EXPECT_EQ(hear(client, "ERROR 3\n"), "ERROR 3\n");
            }
            EXPECT_EQ(count_files("_memory_"), lines.empty() ? 0u : 1u);

            // And back to normal, from whatever state.
            if (!modem()->enabled()) {
                modem()->start();
            }
            diag_dev.forget();
            modem()->process_alive();
            EXPECT_TRUE(both_log("<again>"));
            const std::string end = lines == START ? END : "";
            EXPECT_EQ(hear(subscriber, end), end);
            EXPECT_EQ(resources(), before);
            // The next ones work and only they are answered.
            ASSERT_TRUE(begin(RINGBUF, client));
            ASSERT_TRUE(supply(diag_dev, frame(0x3A, 1)));
            EXPECT_EQ(hear(client, "OK\n"), "OK\n");
            ASSERT_TRUE(begin(DUMP, client));
            ASSERT_TRUE(supply(diag_dev, end_marker()));
            EXPECT_EQ(hear(subscriber, START + END), START + END);
            pump_once(mux());
            EXPECT_EQ(client.heard() + subscriber.heard(), "");
            end_service();
        }
    }
}

TEST_F(TransactionsTest, TheClientMayLeaveOrTheServiceEnd) {
    for (Transaction transaction : {RINGBUF, SLEEP_LOG}) {
        boot_modem(transaction == RINGBUF);
        auto client = std::make_unique<Client>();
        ASSERT_TRUE(begin(transaction, *client));
        client.reset();
        pump_once(mux());
        pump_once(mux());
        // Its transaction goes on without it; nobody else is told.
        Client other;
        EXPECT_EQ(ask(other, REQUESTS[transaction], "ERROR 4\n"), "ERROR 4\n");
        ASSERT_TRUE(supply(diag_dev, frame(transaction == RINGBUF ? 0x3A : 0x3B, 1)));
        EXPECT_EQ(modem()->state(), CWS_WORKING);
        EXPECT_EQ(ask(other, "FLUSH\n", "OK\n"), "OK\n");
        EXPECT_EQ(count_files(transaction == RINGBUF ? "_ringbuf_" : "_sleeplog_"), 1u);
        const size_t descriptors = lasting_descriptors();
        ASSERT_TRUE(begin(transaction, other));
        ctrl.reset();
        EXPECT_LT(lasting_descriptors(), descriptors);
        boot_modem(transaction == RINGBUF);
        ASSERT_TRUE(begin(DUMP, other));
        end_service();
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
            EXPECT_EQ(count_files(".mem") - count_files(".dmp"), dump ? 1u : 0u);
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
        faults::fail(faults::WRITE, 1, EIO);
        EXPECT_EQ(ask(client, REQUESTS[RINGBUF], "ERROR 3\n"), "ERROR 3\n");
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

// A log device that the loop has no room for waits for it.
TEST_F(TransactionsTest, ALogDeviceComesBackWhenTheLoopHasRoom) {
    boot_modem(false);
    modem()->process_assert(false);
    run_clock(3100);
    EXPECT_EQ(modem()->state(), CWS_NOT_WORKING);
    auto fillers = Filler::fill(mux());
    modem()->process_alive();
    EXPECT_TRUE(log.has(": no room to poll log device of cp_wcdma, waiting for it ["));
    fillers.clear();
    EXPECT_TRUE(both_log("<again>"));
}

// A try to open the log device that falls into a transaction is made up for afterwards.
TEST_F(TransactionsTest, ALogDeviceThatIsMissingAtTheStartIsOpenedAfterATransaction) {
    boot_modem(false);
    modem()->stop();
    modem()->set_dev_paths("/nowhere", diag_dev.path().c_str());
    modem()->start();
    modem()->set_dev_paths(log_dev->path().c_str(), diag_dev.path().c_str());
    Client client;
    ASSERT_TRUE(begin(RINGBUF, client));
    run_clock(3100);
    EXPECT_EQ(hear(client, "ERROR 3\n"), "ERROR 3\n");
    ASSERT_GE(modem()->fd(), 0);
    EXPECT_TRUE(both_log("<again>"));
}

}  // namespace
