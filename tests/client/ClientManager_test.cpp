// SPDX-License-Identifier: Apache-2.0

#include "client/ClientManager.h"

#include <sys/prctl.h>

#include "client/uid_list.h"
#include "config/property_names.h"
#include "support/ControlFixture.h"

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

// Its socket fills up; whatever the client misses, nobody waits for it.
TEST_F(ClientManagerTest, AClientThatDoesNotReadHoldsUpNobody) {
    Client lazy(TEST_SERVER), other(TEST_SERVER);
    talk(lazy, "SUBSCRIBE WCN DUMP\n", "OK\n");
    for (int i = 0; i < 20000; ++i) {
        manager->notify_cp_dump(CT_WCN, CDE_START);
    }
    talk(other, "GET_LOG_FILE_SIZE\n", "OK 5\n");
    EXPECT_LT(lazy.heard().size(), 20000 * strlen("CP_DUMP_START WCN\n"));
    EXPECT_EQ(lazy.heard().size() % strlen("CP_DUMP_START WCN\n"), 0u) << "whole lines";
}

// A client of that user, who must be this one unless this one is root.
std::unique_ptr<Client> client_of(uid_t uid) {
    const uid_t own = geteuid();
    EXPECT_EQ(seteuid(uid), 0);
    auto client = std::make_unique<Client>(TEST_SERVER);
    EXPECT_EQ(seteuid(own), 0);
    prctl(PR_SET_DUMPABLE, 1);  // as before, for the leak check
    return client;
}

TEST_F(ClientManagerTest, OnlyTheUsersInThePropertyAreServed) {
    const std::string begin = "static bool ClientManager::may_connect(int): ";
    const std::string no_list = begin + PROP_CONTROL_UIDS + " is no list of user ids, ";
    const uid_t user = geteuid(), uid = user ? user : 65534;
    if (seteuid(uid) != 0 || seteuid(user) != 0) {
        GTEST_SKIP() << "user " << uid << " is none here";
    }
    const std::string own = std::to_string(uid), other = std::to_string(uid + 1);
    const std::string refused = begin + "user " + own + ", process " + std::to_string(getpid()) +
                                ": may not use the control socket, closing it\n";
    const struct {
        std::string uids;
        bool served;
    } cases[] = {
        {"", true},  {own, true}, {other, false}, {own + " ", false}, {other + "," + own, true},
        {"0", false}};
    const size_t descriptors = open_descriptors();
    for (const auto& c : cases) {
        SCOPED_TRACE(c.uids);
        root.set_prop(PROP_CONTROL_UIDS, c.uids);
        log.clear();
        const auto client = client_of(uid);
        if (c.served) {
            talk(*client, "GET_LOG_FILE_SIZE\n", "OK 5\n");
        } else {
            ASSERT_TRUE(client->say("GET_LOG_FILE_SIZE\n"));
        }
        EXPECT_TRUE(c.served || pump([&] { return client->ended(); }));
        EXPECT_EQ(client->heard(), "");
        EXPECT_EQ(log.count(refused), c.served ? 0u : 1u) << log.text();
        EXPECT_EQ(log.has(no_list), c.uids == own + " ");
        client->hang_up();
        EXPECT_TRUE(pump([&] { return manager->client_num() == 0; }));
        if (uid != geteuid()) {
            Client of_root(TEST_SERVER);
            talk(of_root, "GET_LOG_FILE_SIZE\n", "OK 5\n");
            of_root.hang_up();
            EXPECT_TRUE(pump([&] { return manager->client_num() == 0; }));
        }
    }
    // Whoever is turned away does not make the socket rest.
    for (int i = 0; i < 12; ++i) {
        const auto client = client_of(uid);
        EXPECT_TRUE(pump([&] { return client->ended(); }));
    }
    EXPECT_FALSE(manager->resting());
    // Something that has no user at its other end.
    faults::instead.accept4 = [](int, sockaddr*, socklen_t*, int) {
        return ::open("/dev/null", O_RDWR);
    };
    manager->process(POLLIN);
    faults::instead.accept4 = nullptr;
    EXPECT_TRUE(log.has(begin + "can not tell the user of a client, closing it [88("));
    EXPECT_EQ(open_descriptors(), descriptors);
}

TEST(UidList, TakesNothingButDecimalIdsAndCommas) {
    const struct {
        const char* list;
        UidMatch one, thousand;
    } cases[] = {
        {"1", UidMatch::NAMED, UidMatch::NOT_NAMED},
        {"1000", UidMatch::NOT_NAMED, UidMatch::NAMED},
        {"2000,01,1000", UidMatch::NAMED, UidMatch::NAMED},
        {"4294967294", UidMatch::NOT_NAMED, UidMatch::NOT_NAMED},
    };
    for (const auto& c : cases) {
        EXPECT_EQ(find_uid(c.list, 1), c.one) << c.list;
        EXPECT_EQ(find_uid(c.list, 1000), c.thousand) << c.list;
    }
    for (const char* list :
         {"", ",", "1,", ",1", "1,,2", " 1", "1 ", "1, 2", "+1", "-1", "0x1", "1.", "1\n", "system",
          "1;2", "1,4294967295", "1,4294967296", "4294967297", "1,18446744073709551617"}) {
        EXPECT_EQ(find_uid(list, 1), UidMatch::NO_LIST) << list;
    }
    EXPECT_EQ(find_uid({"1\0", 2}, 1), UidMatch::NO_LIST);
    EXPECT_EQ(find_uid({"1,23", 3}, 2), UidMatch::NAMED) << "what lies behind is not read";
}

}  // namespace
