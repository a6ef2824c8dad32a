// SPDX-License-Identifier: Apache-2.0
// Every request in every form is in tests/recordings/requests.in.
#include <regex>

#include "support/ControlFixture.h"

namespace {

typedef ControlFixture ClientRequestsTest;

// The parameters that the table gives a request are those that its handler takes, and its
// reply is of the kind that the table says.
TEST_F(ClientRequestsTest, TheTableOfRequestsTellsTheTruth) {
    const std::map<std::string, std::string> examples = {
        {"", ""},
        {"CP", " WCN"},
        {"CP...", " WCN WCDMA"},
        {"CP WCDMA", " WCDMA WCDMA"},
        {"CP [WCDMA]", " WCDMA"},
        {"CP DUMP", " WCN DUMP"},
        {"MB", " 7"},
        {"INTERNAL|EXTERNAL", " INTERNAL"},
    };
    const std::map<ReplyKind, std::string> replies = {
        {RK_OK, "OK\n|ERROR 3\n"},
        {RK_LATER, "ERROR 5\n"},  // nothing is logged here
        {RK_NUMBER, "OK [0-9]+\n"},
        {RK_WORD, "OK [A-Z]+\n"},
    };
    Client client(TEST_SERVER);
    for (const ControlRequest& request : CONTROL_REQUESTS) {
        const std::string right = request.words + examples.at(request.params);
        const std::string wrong = std::string(request.keyword()) + (*request.params ? "" : " x");
        const std::regex expected(replies.at(request.reply));
        EXPECT_TRUE(std::regex_match(ask(client, right + "\n", "?"), expected)) << right;
        EXPECT_TRUE(std::regex_match(ask(client, wrong + "\n", "?"), std::regex("ERROR [12]\n")))
            << wrong;
    }
}

TEST_F(ClientRequestsTest, ALineOfMoreThan255BytesEndsTheConnection) {
    const std::string longest = "FLUSH" + std::string(250, ' ');
    Client client(TEST_SERVER);
    talk(client, longest + "\n", "OK\n");
    EXPECT_TRUE(client.say(longest + " \n") && pump([&] { return client.ended(); }));
}

}  // namespace
