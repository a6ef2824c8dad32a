// SPDX-License-Identifier: Apache-2.0

#include "client/ClientManager.h"

#include <errno.h>

#include <list>

#include "support/ControlFixture.h"
#include "support/faults.h"

namespace {

typedef ControlFixture ClientManagerTest;

TEST_F(ClientManagerTest, FourthClientWaitsUntilOneLeaves) {
    std::list<Client> clients;
    for (int i = 0; i < 3; ++i) {
        clients.emplace_back(TEST_SERVER);
        talk(clients.back(), "GET_LOG_FILE_SIZE\n", "OK 5\n");
    }
    clients.emplace_back(TEST_SERVER);
    ASSERT_TRUE(clients.back().say("GET_LOG_FILE_SIZE\n"));
    settle();
    EXPECT_FALSE(clients.back().ended());
    EXPECT_EQ(clients.back().heard(), "");
    EXPECT_EQ(log.count("void ClientManager::process(int): new client accepted\n"), 3u);
    clients.pop_front();
    EXPECT_EQ(hear(clients.back(), "OK 5\n"), "OK 5\n");
    EXPECT_EQ(log.count("(ClientHandler*): client disconnected, remaining 2 clients\n"), 1u);
    serve(0);  // no limit
    for (size_t i = 1; i <= 4; ++i) {
        clients.emplace_back(TEST_SERVER);
        talk(clients.back(), "GET_LOG_FILE_SIZE\n", "OK 5\n");
        EXPECT_EQ(manager->client_num(), i);
    }
}

TEST_F(ClientManagerTest, FullLoop) {
    const size_t descriptors = open_descriptors();
    {
        const auto fillers = Filler::fill(mux());
        Client client(TEST_SERVER);
        EXPECT_TRUE(pump([&] { return client.ended(); }));
        EXPECT_EQ(manager->client_num(), 0u);
        EXPECT_TRUE(log.has(
            "void ClientManager::process(int): no room to poll a new client, closing it [105("));
        EXPECT_FALSE(log.has("new client accepted"));
    }
    EXPECT_EQ(open_descriptors(), descriptors);
    manager.reset();
    {
        const auto fillers = Filler::fill(mux());
        serve(3);
        EXPECT_TRUE(log.has("no room to poll server socket, waiting for it [105("));
    }
    // It listens as soon as there is room.
    Client client(TEST_SERVER);
    talk(client, "GET_LOG_FILE_SIZE\n", "OK 5\n");
}

// A client that cannot be accepted stays ready for ever: it took a whole core.
TEST_F(ClientManagerTest, NoDescriptorsLeft) {
    boot_clock::freeze();
    Client client(TEST_SERVER);
    faults::fail(faults::ACCEPT4, 1, EMFILE, faults::FOREVER);
    const int before = faults::calls(faults::ACCEPT4);
    for (int refused : {10, 11, 12}) {
        pass(15);
        EXPECT_EQ(faults::calls(faults::ACCEPT4) - before, refused);
        boot_clock::advance(3000);
    }
    EXPECT_EQ(log.count("server socket gave nothing 10 times in a row"), 1u);
    faults::reset();
    talk(client, "GET_LOG_FILE_SIZE\n", "OK 5\n");
    EXPECT_EQ(manager->idle_wakeups(), 0u);
    // So does a connection whose every read is interrupted.
    ASSERT_TRUE(client.say("GET_LOG_FILE_SIZE\n"));
    faults::fail(faults::READ, 1, EINTR, faults::FOREVER);
    const int reads = faults::calls(faults::READ);
    pass(15);
    EXPECT_EQ(faults::calls(faults::READ) - reads, 10);
    faults::reset();
}

TEST_F(ClientManagerTest, NameThatIsTaken) {
    const size_t descriptors = open_descriptors();
    ClientManager second(ctrl.get(), &mux(), 3);
    EXPECT_EQ(second.init(TEST_SERVER), -1);
    EXPECT_TRUE(log.has("int ClientManager::init(const char*): can not create server socket ["));
    EXPECT_EQ(open_descriptors(), descriptors);
}

}  // namespace
