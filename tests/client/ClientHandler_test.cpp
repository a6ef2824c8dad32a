// Framing, subscriptions, delayed results.
#include "client/ClientHandler.h"

#include <gtest/gtest.h>

#include <memory>

#include "client/ControlFixture.h"

namespace {

class ClientHandlerTest : public ControlFixture {
protected:
    ClientHandlerTest() : manager(new ClientManager(&ctrl, &mux(), 3)) {
        EXPECT_EQ(manager->init(TEST_SERVER), 0);
    }

    // With this reply to come last, nothing else came before or after the others.
    std::string ask_all(Peer& peer, const std::string& requests, const std::string& expected) {
        return ask(peer, requests + "GET_LOG_FILE_SIZE\n", expected + "OK 5\n");
    }
    CpWorkState wcdma_state() { return ctrl.get_cp(CT_WCDMA)->state(); }

    std::unique_ptr<ClientManager> manager;
};

TEST_F(ClientHandlerTest, RequestsMaySplitAnywhere) {
    Peer client(TEST_SERVER);
    const std::string request = "GET_LOG_FILE_SIZE \r\n";
    for (size_t split = 1; split < request.size(); ++split) {
        ASSERT_TRUE(client.send(request.substr(0, split)));
        for (int i = 0; i < 3; ++i) {
            pass(mux());
        }
        ASSERT_EQ(client.receive(), "") << split;
        ASSERT_EQ(ask(client, request.substr(split), "OK 5\n"), "OK 5\n") << split;
    }
    EXPECT_EQ(manager->client_num(), 1u);
}

TEST_F(ClientHandlerTest, Framing) {
    static const struct {
        std::string sent;
        const char* replies;
    } CASES[] = {
        {"GET_LOG_FILE_SIZE\nGET_SD_MAX_SIZE\n", "OK 5\nOK 250\n"},
        {std::string("GET_LOG_FILE_SIZE\0GET_SD_MAX_SIZE\0", 34), "OK 5\nOK 250\n"},
        {std::string("\n\0 \t\r\n\n", 7), ""},
        {std::string("GET_LOG_FILE_SIZE\0\n", 19), "OK 5\n"},
        {"GET_LOG\nGET_SD_MAX_SIZE\n_FILE_SIZE\n", "ERROR 1\nOK 250\nERROR 1\n"},
        {"GET_LOG_FILE_SIZE\xff\n", "ERROR 1\n"},
        {"FLUSH\n" + std::string(255, 'x') + "\n", "OK\nERROR 1\n"},
        {std::string(240, ' ') + "FLUSH\n" + std::string(250, ' ') + "FLUSH\n", "OK\nOK\n"},
        {"SET_SD_MAX_SIZE " + std::string(239, '0') + "\nSET_SD_MAX_SIZE 250\n", "OK\nOK\n"},
        {"SUBSCRIBE WCN DUMP", ""},  // goes on in the next case
        {"\nUNSUBSCRIBE WCN DUMP\n", "OK\nOK\n"},
    };
    Peer client(TEST_SERVER);
    for (const auto& c : CASES) {
        const bool open_ended = c.sent.back() == 'P';
        EXPECT_EQ(open_ended ? ask(client, c.sent, c.replies) : ask_all(client, c.sent, c.replies),
                  c.replies + std::string(open_ended ? "" : "OK 5\n"))
            << c.sent;
    }
}

TEST_F(ClientHandlerTest, RequestTooLongForTheBufferEndsTheConnection) {
    Peer client(TEST_SERVER);
    ASSERT_TRUE(client.send(std::string(256, 'x')));
    for (int i = 0; i < 5; ++i) {
        pass(mux());
    }
    client.receive();
    EXPECT_FALSE(client.closed);  // a full buffer alone is no reason
    ASSERT_TRUE(client.send("\n"));
    EXPECT_TRUE(run_until(mux(), [&] { return client.receive(), client.closed; }));
    EXPECT_EQ(client.got, "");
    EXPECT_TRUE(
        log.has("void ClientManager::process_client_disconn(ClientHandler*): client disconnected, "
                "remaining 0 clients\n"));
}

TEST_F(ClientHandlerTest, PeersThatVanishLeaveNothingBehind) {
    const size_t descriptors = open_descriptors();
    for (const char* last_words : {"", "FLUSH\n", "GET_LOG", "SUBSCRIBE WCN DUMP\nFLUSH\n"}) {
        Peer client(TEST_SERVER);
        ASSERT_TRUE(run_until(mux(), [&] { return manager->client_num() == 1; }));
        ASSERT_TRUE(client.send(last_words));
        pass(mux());
        // Replies that are never read make the last read of the server fail.
        client.hang_up();
        manager->notify_cp_dump(CT_WCN, CDE_START);
        ASSERT_TRUE(run_until(mux(), [&] { return manager->client_num() == 0; })) << last_words;
    }
    EXPECT_EQ(open_descriptors(), descriptors);
}

TEST_F(ClientHandlerTest, NotificationsGoToSubscribersOnly) {
    Peer one(TEST_SERVER);
    Peer two(TEST_SERVER);
    Peer none(TEST_SERVER);
    EXPECT_EQ(ask(one, "SUBSCRIBE WCN DUMP\nSUBSCRIBE WCN DUMP\n", "OK\nOK\n"), "OK\nOK\n");
    EXPECT_EQ(ask(two, "SUBSCRIBE WCN DUMP\nSUBSCRIBE TDD-LTE DUMP\n", "OK\nOK\n"), "OK\nOK\n");
    manager->notify_cp_dump(CT_WCN, CDE_START);
    manager->notify_cp_dump(CT_WCDMA, CDE_START);
    manager->notify_cp_dump(CT_3MODE, CDE_END);
    for (int type : {-1, 8, 9, 1000}) {
        manager->notify_cp_dump(static_cast<CpType>(type), CDE_START);
    }
    manager->notify_cp_dump(CT_WCN, static_cast<CpDumpEvent>(2));
    manager->notify_cp_dump(CT_WCN, CDE_END);
    EXPECT_EQ(ask_all(one, "", "CP_DUMP_START WCN\nCP_DUMP_END WCN\n"),
              "CP_DUMP_START WCN\nCP_DUMP_END WCN\nOK 5\n");
    const char LINES[] = "CP_DUMP_START WCN\nCP_DUMP_END TDD-LTE\nCP_DUMP_END WCN\n";
    EXPECT_EQ(ask_all(two, "", LINES), LINES + std::string("OK 5\n"));
    EXPECT_EQ(ask_all(none, "", ""), "OK 5\n");

    EXPECT_EQ(ask_all(two, "UNSUBSCRIBE WCN DUMP\n", "OK\n"), "OK\nOK 5\n");
    manager->notify_cp_dump(CT_WCN, CDE_START);
    EXPECT_EQ(ask_all(two, "", ""), "OK 5\n");
    EXPECT_EQ(ask_all(one, "", "CP_DUMP_START WCN\n"), "CP_DUMP_START WCN\nOK 5\n");
}

TEST_F(ClientHandlerTest, EveryCpHasItsNameInNotifications) {
    Peer client(TEST_SERVER);
    std::string lines;
    for (const char* name :
         {"WCDMA", "TD", "TDD-LTE", "FDD-LTE", "5MODE", "WCN", "GNSS", "AG-DSP"}) {
        ask(client, "SUBSCRIBE " + std::string(name) + " DUMP\n", "OK\n");
        lines += "CP_DUMP_END " + std::string(name) + "\n";
    }
    for (int type = 0; type < CP_TYPE_NUM; ++type) {
        manager->notify_cp_dump(static_cast<CpType>(type), CDE_END);
    }
    EXPECT_EQ(ask_all(client, "", lines), lines + "OK 5\n");
}

// The socket's buffer fills up; whatever the client misses, nobody waits for it.
TEST_F(ClientHandlerTest, ClientThatDoesNotReadHoldsUpNobody) {
    Peer lazy(TEST_SERVER);
    Peer other(TEST_SERVER);
    ASSERT_EQ(ask(lazy, "SUBSCRIBE WCN DUMP\n", "OK\n"), "OK\n");
    for (int i = 0; i < 20000; ++i) {
        manager->notify_cp_dump(CT_WCN, CDE_START);
    }
    std::string requests;
    for (int i = 0; i < 40; ++i) {
        requests += "FLUSH\n";
    }
    EXPECT_TRUE(lazy.send(requests));
    EXPECT_EQ(ask(other, "GET_LOG_FILE_SIZE\n", "OK 5\n"), "OK 5\n");
    EXPECT_EQ(manager->client_num(), 2u);
    // It gets whole lines, and is served again as soon as it reads.
    const std::string got = lazy.receive();
    ASSERT_FALSE(got.empty());
    EXPECT_EQ(got.size() % strlen("CP_DUMP_START WCN\n"), 0u);
    lazy.got.clear();
    run_until(mux(), [&] { return lazy.receive(), true; });
    lazy.got.clear();
    EXPECT_EQ(ask_all(lazy, "", ""), "OK 5\n");
}

TEST_F(ClientHandlerTest, SecondTransactionIsRefusedWhileTheFirstRuns) {
    Peer client(TEST_SERVER);
    Peer other(TEST_SERVER);
    ASSERT_EQ(ask(client, "ENABLE_LOG WCDMA\n", "OK\n"), "OK\n");
    ASSERT_EQ(ask(client, "SAVE_RINGBUF WCDMA\nSAVE_SLEEP_LOG WCDMA\nSAVE_RINGBUF WCDMA\n",
                  "ERROR 4\nERROR 4\n"),
              "ERROR 4\nERROR 4\n");
    EXPECT_TRUE(log.has("proc_sleep_log(const uint8_t*, size_t): Save sleep log error -2 ["));
    EXPECT_EQ(wcdma_state(), CWS_SAVE_RINGBUF);
    // Nothing is read from it now, but notified it is.
    ASSERT_TRUE(client.send("GET_LOG_STATE WCDMA\nGET_SD_MAX_SIZE\n"));
    EXPECT_EQ(ask(other, "SAVE_RINGBUF WCDMA\nkestctl clear\n", "ERROR 4\nERROR 4\n"),
              "ERROR 4\nERROR 4\n");
    EXPECT_EQ(client.receive(), "");
    // The first goes on: its result is what a stopped transaction gives.
    EXPECT_EQ(ask(other, "DISABLE_LOG WCDMA\n", "OK\n"), "OK\n");
    EXPECT_EQ(replies(client, "ERROR 3\nOK OFF\nOK 250\n"), "ERROR 3\nOK OFF\nOK 250\n");
    EXPECT_EQ(log.count("void ClientHandler::proc_ringbuf_result(int): SAVE_RINGBUF result -1\n"),
              1u);
    EXPECT_FALSE(log.has("SAVE_SLEEP_LOG result"));
}

// A client's own later request, read together with the first, ends its transaction.
TEST_F(ClientHandlerTest, TransactionThatEndsInTheSamePass) {
    Peer client(TEST_SERVER);
    ASSERT_EQ(ask(client, "ENABLE_LOG WCDMA\n", "OK\n"), "OK\n");
    for (int i = 0; i < 3; ++i) {
        EXPECT_EQ(ask(client,
                      "SAVE_SLEEP_LOG WCDMA\nDISABLE_LOG WCDMA\nENABLE_LOG WCDMA\n"
                      "GET_LOG_STATE WCDMA\n",
                      "ERROR 3\nOK\nOK\nOK ON\n"),
                  "ERROR 3\nOK\nOK\nOK ON\n");
    }
}

TEST_F(ClientHandlerTest, ClientGoneBeforeItsResult) {
    Peer client(TEST_SERVER);
    Peer other(TEST_SERVER);
    ASSERT_EQ(ask(client, "ENABLE_LOG WCDMA\n", "OK\n"), "OK\n");
    ASSERT_TRUE(client.send("SAVE_SLEEP_LOG WCDMA\n"));
    ASSERT_TRUE(run_until(mux(), [&] { return wcdma_state() == CWS_SAVE_SLEEP_LOG; }));
    client.hang_up();
    EXPECT_EQ(ask(other, "DISABLE_LOG WCDMA\nENABLE_LOG WCDMA\n", "OK\nOK\n"), "OK\nOK\n");
    ASSERT_TRUE(run_until(mux(), [&] { return manager->client_num() == 1; }));
    EXPECT_EQ(ask(other, "SAVE_SLEEP_LOG WCDMA\nGET_SD_MAX_SIZE\n", "OK 250\n"), "OK 250\n");
    // Destroyed with its transaction running: the result comes to nobody.
    manager.reset();
    EXPECT_EQ(wcdma_state(), CWS_SAVE_SLEEP_LOG);
    const CpType wcdma = CT_WCDMA;
    EXPECT_EQ(ctrl.disable_log(&wcdma, 1), 0);
    EXPECT_EQ(wcdma_state(), CWS_WORKING);
}

// Handlers made by hand: what the sockets alone do not bring about.
class LoneClientTest : public ClientHandlerTest {
protected:
    LoneClientTest() {
        int fds[2];
        EXPECT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0, fds), 0);
        peer.reset(new Peer(fds[0]));
        client = new ClientHandler(fds[1], &ctrl, &mux(), manager.get());
        client->add_events(POLLIN);
    }
    void request(const std::string& text) {
        client->process_req(reinterpret_cast<const uint8_t*>(text.data()), text.size());
    }

    std::unique_ptr<Peer> peer;
    ClientHandler* client;  // goes through the manager
};

TEST_F(LoneClientTest, ResultCodes) {
    static const struct {
        int result;
        const char* reply;
    } CASES[] = {{0, "OK\n"},       {-1, "ERROR 3\n"}, {-2, "ERROR 4\n"},
                 {-3, "ERROR 5\n"}, {-4, "ERROR 6\n"}, {-5, "ERROR 7\n"},
                 {-6, "ERROR 8\n"}, {-7, "ERROR 3\n"}, {1, "ERROR 3\n"}};
    ASSERT_EQ(ask(*peer, "ENABLE_LOG WCDMA\n", "OK\n"), "OK\n");
    LogPipeHandler* const channel = ctrl.get_cp(CT_WCDMA);
    for (const auto& c : CASES) {
        request("SAVE_RINGBUF WCDMA");
        ASSERT_EQ(channel->state(), CWS_SAVE_RINGBUF);
        client->notify_trans_result(c.result);
        EXPECT_EQ(replies(*peer, c.reply), c.reply);
        log.clear();
        client->notify_trans_result(c.result);
        EXPECT_TRUE(log.has(
            "void ClientHandler::notify_trans_result(int): Non CTS_EXECUTING state notification " +
            std::to_string(c.result) + " ["));
        channel->stop();
        EXPECT_EQ(ask(*peer, "DISABLE_LOG WCDMA\nENABLE_LOG WCDMA\n", "OK\nOK\n"), "OK\nOK\n");
    }
    manager->process_client_disconn(client);
}

TEST_F(LoneClientTest, SpuriousWakeUpDoesNothing) {
    client->process(POLLIN);
    EXPECT_EQ(ask_all(*peer, "", ""), "OK 5\n");
    manager->process_client_disconn(client);
}

TEST_F(LoneClientTest, ClientThatCannotBePolledAgainIsAnsweredAndClosed) {
    ASSERT_EQ(ask(*peer, "ENABLE_LOG WCDMA\n", "OK\n"), "OK\n");
    request("SAVE_SLEEP_LOG WCDMA");
    {
        Occupants occupants(mux());
        client->notify_trans_result(0);
        EXPECT_EQ(peer->receive(), "OK\n");
        EXPECT_TRUE(peer->closed);
    }
    EXPECT_TRUE(log.has("no room to poll the client"));
    ctrl.get_cp(CT_WCDMA)->stop();  // answers nobody
    Peer next(TEST_SERVER);
    EXPECT_EQ(ask_all(next, "", ""), "OK 5\n");
}

}  // namespace
