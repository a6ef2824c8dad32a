#include "client/ClientManager.h"

#include <gtest/gtest.h>
#include <stdarg.h>

#include <memory>

#include "client/ControlFixture.h"

namespace {

int g_setfl_calls_to_pass = -1;  // then F_SETFL fails; negative: it never does

}  // namespace

extern "C" int __real_fcntl(int fd, int cmd, ...);
extern "C" int __wrap_fcntl(int fd, int cmd, ...);
extern "C" int __wrap_fcntl(int fd, int cmd, ...) {
    va_list args;
    va_start(args, cmd);
    void* const arg = va_arg(args, void*);
    va_end(args);
    if (cmd == F_SETFL && g_setfl_calls_to_pass >= 0 && g_setfl_calls_to_pass-- == 0) {
        errno = EPERM;
        return -1;
    }
    return __real_fcntl(fd, cmd, arg);
}

namespace {

class ClientManagerTest : public ControlFixture {
protected:
    ~ClientManagerTest() override { g_setfl_calls_to_pass = -1; }
};

TEST_F(ClientManagerTest, FourthClientWaitsUntilOneLeaves) {
    ClientManager manager(&ctrl, &mux(), 3);
    ASSERT_EQ(manager.init(TEST_SERVER), 0);
    for (int round = 0; round < 2; ++round) {
        std::list<Peer> clients;
        for (int i = 0; i < 4; ++i) {
            clients.emplace_back(TEST_SERVER);
            ASSERT_TRUE(clients.back().send("GET_LOG_FILE_SIZE\n"));
        }
        int served = 0;
        for (Peer& client : clients) {
            if (++served <= 3) {
                EXPECT_EQ(replies(client, "OK 5\n"), "OK 5\n");
            }
        }
        for (int i = 0; i < 5; ++i) {
            pass(mux());
        }
        EXPECT_EQ(clients.back().receive(), "");
        EXPECT_FALSE(clients.back().closed);
        EXPECT_EQ(log.count("void ClientManager::process(int): new client accepted\n"), 3u);
        clients.pop_front();
        EXPECT_EQ(replies(clients.back(), "OK 5\n"), "OK 5\n");
        EXPECT_EQ(log.count("(ClientHandler*): client disconnected, remaining 2 clients\n"), 1u);
        clients.clear();
        ASSERT_TRUE(run_until(mux(), [&] { return manager.client_num() == 0; }));
        log.clear();
    }
}

TEST_F(ClientManagerTest, NoLimit) {
    ClientManager manager(&ctrl, &mux(), 0);
    ASSERT_EQ(manager.init(TEST_SERVER), 0);
    std::list<Peer> clients;
    for (size_t i = 1; i <= 8; ++i) {
        clients.emplace_back(TEST_SERVER);
        EXPECT_EQ(ask(clients.back(), "GET_LOG_FILE_SIZE\n", "OK 5\n"), "OK 5\n");
        EXPECT_EQ(manager.client_num(), i);
    }
}

TEST_F(ClientManagerTest, ClientForWhomTheLoopHasNoRoomIsClosedAtOnce) {
    ClientManager manager(&ctrl, &mux(), 3);
    ASSERT_EQ(manager.init(TEST_SERVER), 0);
    const size_t descriptors = open_descriptors();
    {
        Occupants occupants(mux());
        Peer client(TEST_SERVER);
        EXPECT_TRUE(run_until(mux(), [&] { return client.receive(), client.closed; }));
        EXPECT_EQ(manager.client_num(), 0u);
        EXPECT_TRUE(log.has("void ClientManager::process(int): no room to poll a new client"));
        EXPECT_FALSE(log.has("new client accepted"));
    }
    EXPECT_EQ(open_descriptors(), descriptors);
    Peer client(TEST_SERVER);
    EXPECT_EQ(ask(client, "GET_LOG_FILE_SIZE\n", "OK 5\n"), "OK 5\n");
}

// The loop is full when the server wants to listen (again): it does so later.
TEST_F(ClientManagerTest, ListensAsSoonAsTheLoopHasRoom) {
    ClientManager manager(&ctrl, &mux(), 3);
    {
        Occupants occupants(mux());
        ASSERT_EQ(manager.init(TEST_SERVER), 0);
        EXPECT_TRUE(log.has("no room to poll the server socket"));
    }
    Peer client(TEST_SERVER);
    EXPECT_EQ(ask(client, "GET_LOG_FILE_SIZE\n", "OK 5\n"), "OK 5\n");
}

TEST_F(ClientManagerTest, FailuresOfTheServerSocket) {
    const size_t descriptors = open_descriptors();
    ClientManager manager(&ctrl, &mux(), 3);
    g_setfl_calls_to_pass = 0;
    EXPECT_EQ(manager.init(TEST_SERVER), -1);
    EXPECT_TRUE(
        log.has("int ClientManager::init(const char*): set server socket non-block error ["));
    EXPECT_EQ(manager.fd(), -1);
    EXPECT_EQ(open_descriptors(), descriptors);

    ASSERT_EQ(manager.init(TEST_SERVER), 0);
    ClientManager second(&ctrl, &mux(), 3);
    EXPECT_EQ(second.init(TEST_SERVER), -1);  // the name is taken
    EXPECT_TRUE(log.has("int ClientManager::init(const char*): can not create server socket ["));
}

TEST_F(ClientManagerTest, ClientIsServedEvenOnABlockingSocket) {
    ClientManager manager(&ctrl, &mux(), 3);
    ASSERT_EQ(manager.init(TEST_SERVER), 0);
    Peer client(TEST_SERVER);
    g_setfl_calls_to_pass = 0;
    EXPECT_EQ(ask(client, "GET_LOG_FILE_SIZE\n", "OK 5\n"), "OK 5\n");
    EXPECT_TRUE(
        log.has("void ClientManager::process(int): set accepted socket to O_NONBLOCK error [1("));
}

}  // namespace
