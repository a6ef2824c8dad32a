#include "client/ClientManager.h"

#include <gtest/gtest.h>

#include "client/ControlFixture.h"

namespace {

typedef ClientFixture ClientManagerTest;

TEST_F(ClientManagerTest, FourthClientWaitsUntilOneLeaves) {
    for (int round = 0; round < 2; ++round) {
        std::list<Peer> clients;
        for (int i = 0; i < 3; ++i) {
            clients.emplace_back(TEST_SERVER);
            talk(clients.back(), "GET_LOG_FILE_SIZE\n", "OK 5\n");
        }
        clients.emplace_back(TEST_SERVER);
        ASSERT_TRUE(clients.back().send("GET_LOG_FILE_SIZE\n"));
        settle();
        EXPECT_FALSE(clients.back().ended());
        EXPECT_EQ(clients.back().got, "");
        EXPECT_EQ(log.count("void ClientManager::process(int): new client accepted\n"), 3u);
        clients.pop_front();
        EXPECT_EQ(replies(clients.back(), "OK 5\n"), "OK 5\n");
        EXPECT_EQ(log.count("(ClientHandler*): client disconnected, remaining 2 clients\n"), 1u);
        clients.clear();
        ASSERT_TRUE(run_until(mux(), [&] { return manager->client_num() == 0; }));
        log.clear();
    }
    serve(0);  // no limit
    std::list<Peer> clients;
    for (size_t i = 1; i <= 8; ++i) {
        clients.emplace_back(TEST_SERVER);
        talk(clients.back(), "GET_LOG_FILE_SIZE\n", "OK 5\n");
        EXPECT_EQ(manager->client_num(), i);
    }
}

TEST_F(ClientManagerTest, FullLoop) {
    const size_t descriptors = open_descriptors();
    {
        Occupants occupants(mux());
        Peer client(TEST_SERVER);
        EXPECT_TRUE(run_until(mux(), [&] { return client.ended(); }));
        EXPECT_EQ(manager->client_num(), 0u);
        EXPECT_TRUE(log.has("void ClientManager::process(int): no room to poll a new client"));
        EXPECT_FALSE(log.has("new client accepted"));
    }
    EXPECT_EQ(open_descriptors(), descriptors);
    manager.reset();
    {
        Occupants occupants(mux());
        serve(3);
        EXPECT_TRUE(log.has("no room to poll the server socket"));
    }
    // It listens as soon as there is room.
    Peer client(TEST_SERVER);
    talk(client, "GET_LOG_FILE_SIZE\n", "OK 5\n");
}

TEST_F(ClientManagerTest, NameThatIsTaken) {
    const size_t descriptors = open_descriptors();
    ClientManager second(&ctrl, &mux(), 3);
    EXPECT_EQ(second.init(TEST_SERVER), -1);
    EXPECT_TRUE(log.has("int ClientManager::init(const char*): can not create server socket ["));
    EXPECT_EQ(open_descriptors(), descriptors);
}

}  // namespace
