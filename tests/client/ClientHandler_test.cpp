// SPDX-License-Identifier: Apache-2.0
// How requests are cut out of what a client sends.
#include "client/ClientHandler.h"

#include "support/ControlFixture.h"

namespace {

class ClientHandlerTest : public ControlFixture {
protected:
    // With the last reply, nothing else came before or after the others.
    void talk_to_end(Client& peer, const std::string& requests, const std::string& expected) {
        talk(peer, requests + "GET_LOG_FILE_SIZE\n", expected + "OK 5\n");
    }
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

}  // namespace
