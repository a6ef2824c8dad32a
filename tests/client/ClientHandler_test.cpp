// SPDX-License-Identifier: Apache-2.0
// Framing, subscriptions, delayed results.
#include "client/ClientHandler.h"

#include "support/ControlFixture.h"

namespace {

class ClientHandlerTest : public ControlFixture {
protected:
    // With the last reply, nothing else came before or after the others.
    void talk_to_end(Client& peer, const std::string& requests, const std::string& expected) {
        talk(peer, requests + "GET_LOG_FILE_SIZE\n", expected + "OK 5\n");
    }
    CpWorkState wcdma_state() { return ctrl->get_cp(CT_WCDMA)->state(); }
};

TEST_F(ClientHandlerTest, Framing) {
    static const struct {
        std::string sent;
        const char* replies;
    } CASES[] = {
        {"GET_LOG_FILE_SIZE\nGET_SD_MAX_SIZE\n", "OK 5\nOK 250\n"},
        {std::string("GET_LOG_FILE_SIZE\0GET_SD_MAX_SIZE\0", 34), "OK 5\nOK 250\n"},
        {std::string("\n\0 \t\r\n\n", 7), ""},
        {"GET_LOG_FILE_SIZE\xff\n", "ERROR 1\n"},
        {std::string(255, 'x') + "\nFLUSH\n", "ERROR 1\nOK\n"},
        {"SET_SD_MAX_SIZE " + std::string(239, '0') + "\nSET_SD_MAX_SIZE 250\n", "OK\nOK\n"},
    };
    Client client(TEST_SERVER);
    for (const auto& c : CASES) {
        talk_to_end(client, c.sent, c.replies);
        // Split before its end, after another one.
        ASSERT_TRUE(client.say("\nGET_LOG_FI"));
        settle();
        ASSERT_EQ(client.heard(), "");
        talk(client, "LE_SIZE\n", "OK 5\n");
    }
    // Without a terminator the buffer is full: alone that is no reason to hang up.
    ASSERT_TRUE(client.say(std::string(256, 'x')));
    settle();
    EXPECT_FALSE(client.ended());
    ASSERT_TRUE(client.say("\n"));
    EXPECT_TRUE(pump([&] { return client.ended(); }));
    EXPECT_EQ(client.heard(), "");
    EXPECT_TRUE(
        log.has("void ClientManager::process_client_disconn(ClientHandler*): client disconnected, "
                "remaining 0 clients\n"));
}

TEST_F(ClientHandlerTest, PeerThatVanishesLeavesNothingBehind) {
    const size_t descriptors = open_descriptors();
    Client client(TEST_SERVER);
    ASSERT_TRUE(pump([&] { return manager->client_num() == 1; }));
    ASSERT_TRUE(client.say("SUBSCRIBE WCN DUMP\nFLUSH\n"));
    pump_once(mux());
    // Replies that are never read make the last read of the server fail.
    client.hang_up();
    manager->notify_cp_dump(CT_WCN, CDE_START);
    ASSERT_TRUE(pump([&] { return manager->client_num() == 0; }));
    EXPECT_EQ(open_descriptors(), descriptors);
}

TEST_F(ClientHandlerTest, NotificationsGoToSubscribersOnly) {
    Client one(TEST_SERVER), both(TEST_SERVER), none(TEST_SERVER);
    talk(one, "SUBSCRIBE WCN DUMP\nSUBSCRIBE WCN DUMP\n", "OK\nOK\n");
    talk(both, "SUBSCRIBE WCN DUMP\nSUBSCRIBE AG-DSP DUMP\n", "OK\nOK\n");
    for (int type = -1; type < CP_TYPE_NUM + 2; ++type) {
        manager->notify_cp_dump(static_cast<CpType>(type), CDE_END);
    }
    manager->notify_cp_dump(CT_WCN, static_cast<CpDumpEvent>(2));
    manager->notify_cp_dump(CT_WCN, CDE_START);
    talk_to_end(one, "", "CP_DUMP_END WCN\nCP_DUMP_START WCN\n");
    talk_to_end(both, "UNSUBSCRIBE WCN DUMP\n",
                "CP_DUMP_END WCN\nCP_DUMP_END AG-DSP\nCP_DUMP_START WCN\nOK\n");
    talk_to_end(none, "", "");
    manager->notify_cp_dump(CT_WCN, CDE_END);
    talk_to_end(one, "", "CP_DUMP_END WCN\n");
    talk_to_end(both, "", "");
}

// The socket's buffer fills up; whatever the client misses, nobody waits for it.
TEST_F(ClientHandlerTest, ClientThatDoesNotReadHoldsUpNobody) {
    Client lazy(TEST_SERVER);
    Client other(TEST_SERVER);
    talk(lazy, "SUBSCRIBE WCN DUMP\n", "OK\n");
    for (int i = 0; i < 20000; ++i) {
        manager->notify_cp_dump(CT_WCN, CDE_START);
    }
    EXPECT_TRUE(lazy.say("FLUSH\nFLUSH\nFLUSH\n"));
    talk(other, "GET_LOG_FILE_SIZE\n", "OK 5\n");
    settle();
    EXPECT_EQ(manager->client_num(), 2u);
    // It gets whole lines, and is served again as soon as it reads.
    const std::string got = lazy.heard();
    ASSERT_FALSE(got.empty());
    EXPECT_EQ(got.size() % strlen("CP_DUMP_START WCN\n"), 0u);
    lazy.forget();
    talk_to_end(lazy, "", "");
}

TEST_F(ClientHandlerTest, SecondTransactionIsRefusedWhileTheFirstRuns) {
    Client client(TEST_SERVER);
    Client other(TEST_SERVER);
    talk(client, "ENABLE_LOG WCDMA\n", "OK\n");
    talk(other, "FLUSH\n", "OK\n");
    // A loop without room: the client keeps its place in it.
    const auto fillers = Filler::fill(mux());
    talk(client, "SAVE_RINGBUF WCDMA\nSAVE_SLEEP_LOG WCDMA\nSAVE_RINGBUF WCDMA\n",
         "ERROR 4\nERROR 4\n");
    EXPECT_TRUE(log.has("proc_sleep_log(const uint8_t*, size_t): Save sleep log error -2 ["));
    EXPECT_EQ(wcdma_state(), CWS_SAVE_RINGBUF);
    ASSERT_TRUE(client.say("GET_LOG_STATE WCDMA\nGET_SD_MAX_SIZE\n"));
    talk(other, "SAVE_RINGBUF WCDMA\nkestctl clear\n", "ERROR 4\nERROR 4\n");
    EXPECT_EQ(client.heard(), "");
    // The first goes on: its result is what a stopped transaction gives.
    talk(other, "DISABLE_LOG WCDMA\n", "OK\n");
    EXPECT_EQ(hear(client, "ERROR 3\nOK OFF\nOK 250\n"), "ERROR 3\nOK OFF\nOK 250\n");
    EXPECT_EQ(log.count("void ClientHandler::proc_ringbuf_result(int): SAVE_RINGBUF result -1\n"),
              1u);
    EXPECT_FALSE(log.has("SAVE_SLEEP_LOG result"));
    // A client's own later request, read together with the first, ends its transaction.
    talk(client, "ENABLE_LOG WCDMA\nSAVE_SLEEP_LOG WCDMA\nDISABLE_LOG WCDMA\nFLUSH\n",
         "OK\nERROR 3\nOK\nOK\n");
}

TEST_F(ClientHandlerTest, ClientGoneBeforeItsResult) {
    Client client(TEST_SERVER);
    Client other(TEST_SERVER);
    talk(client, "ENABLE_LOG WCDMA\n", "OK\n");
    ASSERT_TRUE(client.say("SAVE_SLEEP_LOG WCDMA\n"));
    ASSERT_TRUE(pump([&] { return wcdma_state() == CWS_SAVE_SLEEP_LOG; }));
    // Its place is free at once, what it had sent is done, and the transaction runs on.
    ASSERT_TRUE(client.say("SAVE_RINGBUF WCDMA\nSET_SD_MAX_SIZE 77\n"));
    client.hang_up();
    ASSERT_TRUE(pump([&] { return manager->client_num() == 1; }));
    EXPECT_EQ(wcdma_state(), CWS_SAVE_SLEEP_LOG);
    talk(other, "GET_SD_MAX_SIZE\nDISABLE_LOG WCDMA\nENABLE_LOG WCDMA\n", "OK 77\nOK\nOK\n");

    // One that only has nothing more to say gets its reply, and is closed then.
    Client piped(TEST_SERVER);
    ASSERT_TRUE(piped.say("SAVE_SLEEP_LOG WCDMA\n"));
    shutdown(piped.fd(), SHUT_WR);
    ASSERT_TRUE(pump([&] { return wcdma_state() == CWS_SAVE_SLEEP_LOG; }));
    settle();
    EXPECT_EQ(manager->client_num(), 2u);
    talk(other, "DISABLE_LOG WCDMA\nENABLE_LOG WCDMA\n", "OK\nOK\n");
    ASSERT_TRUE(pump([&] { return piped.ended(); }));
    EXPECT_EQ(piped.heard(), "ERROR 3\n");

    // Destroyed with its transaction running: the result comes to nobody.
    talk(other, "SAVE_SLEEP_LOG WCDMA\nSET_SD_MAX_SIZE 250\n", "OK\n");
    manager.reset();
    EXPECT_EQ(wcdma_state(), CWS_SAVE_SLEEP_LOG);
    ctrl->get_cp(CT_WCDMA)->stop();
    EXPECT_EQ(wcdma_state(), CWS_WORKING);
}

}  // namespace
