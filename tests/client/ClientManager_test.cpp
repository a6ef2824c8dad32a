// SPDX-License-Identifier: Apache-2.0

#include "client/ClientManager.h"

#include "support/ControlFixture.h"
#include "support/faults.h"

namespace {

typedef ControlFixture ClientManagerTest;

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
    client.hang_up();
    EXPECT_TRUE(pump([&] {
        return log.has(
            "void ClientManager::process_client_disconn(ClientHandler*): client "
            "disconnected, remaining 0 clients\n");
    }));
}

}  // namespace
