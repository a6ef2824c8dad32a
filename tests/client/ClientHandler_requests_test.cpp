// SPDX-License-Identifier: Apache-2.0
// Every request in every form, by what the client reads and what is logged.
#include <map>
#include <regex>
#include <sstream>

#include "support/ControlFixture.h"

namespace {

class ClientRequestsTest : public ControlFixture {
protected:
    // What request handlers have logged, without their names; "[E]" for errno.
    std::string logged() {
        std::istringstream text(log.text());
        std::string result;
        const std::regex proc(
            ".*void ClientHandler::proc.*\\(const uint8_t\\*, size_t\\): ([^]*?)( "
            "\\[\\d+\\(.*\\)\\])?");
        std::smatch match;
        for (std::string line; std::getline(text, line);) {
            if (std::regex_match(line, match, proc)) {
                result += (result.empty() ? "" : "|") + match.str(1);
                result += match[2].matched ? " [E]" : "";
            }
        }
        log.clear();
        return result;
    }
};

// In order, on one connection. No log device yields data, no CP but WCDMA and WCN has a
// channel and WCN has no device.
const struct {
    const char *request, *reply, *log;
} CASES[] = {
    {"GET_LOG_STATE", "ERROR 2", "GET_LOG_STATE no param [E]"},
    {"GET_LOG_STATE cp_wcdma", "ERROR 9", "GET_LOG_STATE invalid CP type [E]"},
    {"DISABLE_IQ", "ERROR 2", "DISABLE_IQ no param [E]"},
    {"DISABLE_IQ GNSS", "ERROR 3", "disable_iq error -7 [E]"},
    {"DISABLE_IQ WCDMA", "OK", ""},
    {"ENABLE_IQ", "ERROR 2", "ENABLE_IQ no param [E]"},
    {"ENABLE_IQ WCDMA", "ERROR 2", "ENABLE_IQ no I/Q type [E]"},
    {"ENABLE_IQ WCDMA GSM", "ERROR 2", "ENABLE_IQ unknown I/Q type [E]"},
    {"ENABLE_IQ 5MODE WCDMA", "ERROR 3", "enable_iq error -7 [E]"},
    {"ENABLE_IQ WCDMA WCDMA more", "OK", ""},
    {"DISABLE_IQ WCDMA WCDMA more", "ERROR 3", "disable_iq error -1 [E]"},
    {"SAVE_SLEEP_LOG", "ERROR 2", "SAVE_SLEEP_LOG|SAVE_SLEEP_LOG no param [E]"},
    {"SAVE_SLEEP_LOG WCDMA 1", "ERROR 2", "SAVE_SLEEP_LOG|SAVE_SLEEP_LOG extra parameter [E]"},
    {"SAVE_SLEEP_LOG AG-DSP", "ERROR 2", "SAVE_SLEEP_LOG|SAVE_SLEEP_LOG unknown CP [E]"},
    {"SAVE_SLEEP_LOG WCDMA\r", "ERROR 5", "SAVE_SLEEP_LOG|Save sleep log error -3 [E]"},
    {"SAVE_RINGBUF", "ERROR 2", "SAVE_RINGBUF|SAVE_RINGBUF no param [E]"},
    {"SAVE_RINGBUF WCN", "ERROR 5", "SAVE_RINGBUF|Save ringbuf error -3 [E]"},
    {"ENABLE_LOG", "ERROR 2", "ENABLE_LOG "},
    {"ENABLE_LOG WCDMA X", "ERROR 2", "ENABLE_LOG  WCDMA X"},
    {"ENABLE_LOG WCDMA TD TDD-LTE FDD-LTE 5MODE WCN", "ERROR 2",
     "ENABLE_LOG  WCDMA TD TDD-LTE FDD-LTE 5MODE WCN"},
    {"ENABLE_LOG \t GNSS TD\tTDD-LTE AG-DSP WCDMA\r", "OK",
     "ENABLE_LOG  \t GNSS TD\tTDD-LTE AG-DSP WCDMA\r"},
    {"DISABLE_LOG", "ERROR 2", "DISABLE_LOG "},
    {"DISABLE_LOG WCDMA WCN WCDMA", "ERROR 2", "DISABLE_LOG  WCDMA WCN WCDMA"},
    {"GET_LOG_STATE WCDMA", "OK ON", ""},
    {"FLUSH", "OK", ""},
    {"FLUSH now", "ERROR 1", ""},
    {"DISABLE_LOG WCDMA", "OK", "DISABLE_LOG  WCDMA"},
    {"GET_LOG_STATE WCDMA", "OK OFF", ""},
    {"kestctl again clear", "ERROR 1", ""},
    {"kestctl reload more", "ERROR 3", "reload kest.conf"},  // there is no file
    {"kestctl clear more", "OK", "remove CP log"},
    {"SET_LOG_FILE_SIZE", "ERROR 2", "SET_LOG_FILE_SIZE invalid parameter [E]"},
    {"SET_LOG_FILE_SIZE 4294967296", "ERROR 2", "SET_LOG_FILE_SIZE invalid size [E]"},
    {"SET_LOG_FILE_SIZE 18446744073709551617", "ERROR 2", "SET_LOG_FILE_SIZE invalid size [E]"},
    {"SET_LOG_FILE_SIZE 7 8", "ERROR 2", "SET_LOG_FILE_SIZE 7"},
    {"SET_LOG_FILE_SIZE 0", "OK", "SET_LOG_FILE_SIZE 0"},
    {"SET_LOG_FILE_SIZE 4294967295\r", "OK", "SET_LOG_FILE_SIZE 4294967295"},
    {"GET_LOG_FILE_SIZE", "OK 4294967295", "GET_LOG_FILE_SIZE 4294967295"},
    {"GET_LOG_FILE_SIZE x", "ERROR 2", "GET_LOG_FILE_SIZE invalid param [E]"},
    {"SET_DATA_MAX_SIZE", "ERROR 2", "SET_DATA_MAX_SIZE no param [E]"},
    {"SET_DATA_MAX_SIZE -1", "ERROR 2", "SET_DATA_MAX_SIZE invalid param [E]"},
    {"SET_DATA_MAX_SIZE 000000000000000000000000000012", "OK", "SET_DATA_MAX_SIZE 12"},
    {"GET_DATA_MAX_SIZE", "OK 12", "GET_DATA_MAX_SIZE 12"},
    {"GET_DATA_MAX_SIZE 12", "ERROR 2", "GET_DATA_MAX_SIZE invalid param [E]"},
    {"SET_SD_MAX_SIZE \r", "ERROR 2", "SET_SD_MAX_SIZE no param [E]"},
    {"SET_SD_MAX_SIZE +1", "ERROR 2", "SET_SD_MAX_SIZE invalid size [E]"},
    {"SET_SD_MAX_SIZE 300", "OK", "SET_SD_MAX_SIZE 300"},
    {"GET_SD_MAX_SIZE", "OK 300", "GET_SD_MAX_SIZE 300"},
    {"GET_SD_MAX_SIZE x", "ERROR 2", "GET_SD_MAX_SIZE invalid param [E]"},
    {"DISABLE_LOG_OVERWRITE 1", "ERROR 2", "DISABLE_LOG_OVERWRITE invalid param [E]"},
    {"DISABLE_LOG_OVERWRITE", "OK", "DISABLE_LOG_OVERWRITE"},
    {"GET_LOG_OVERWRITE", "OK DISABLE", "GET_LOG_OVERWRITE DISABLE"},
    {"ENABLE_LOG_OVERWRITE x", "ERROR 2", "ENABLE_LOG_OVERWRITE invalid param [E]"},
    {"ENABLE_LOG_OVERWRITE\r", "OK", "ENABLE_LOG_OVERWRITE"},
    {"GET_LOG_OVERWRITE", "OK ENABLE", "GET_LOG_OVERWRITE ENABLE"},
    {"GET_LOG_OVERWRITE x", "ERROR 2", "GET_LOG_OVERWRITE invalid param [E]"},
    {"ENABLE_MD", "OK", ""},
    {"ENABLE_MD\r", "ERROR 2", ""},
    {"DISABLE_MD ", "OK", ""},
    {"MINI_DUMP", "ERROR 3", ""},
    {"MINI_DUMP \r", "ERROR 2", ""},
    {"SET_MD_STOR_POS", "ERROR 2", "SET_MD_STOR_POS invalid param [E]"},
    {"SET_MD_STOR_POS INTERNAL x", "OK", "SET_MD_STOR_POS: INTERNAL."},
    {"GET_MD_STOR_POS", "OK INTERNAL", "GET_MD_STOR_POS INTERNAL."},
    {"SET_MD_STOR_POS internal", "OK", "SET_MD_STOR_POS: EXTERNAL."},
    {"GET_MD_STOR_POS", "OK EXTERNAL", "GET_MD_STOR_POS EXTERNAL."},
    {"GET_MD_STOR_POS x", "ERROR 2", "GET_MD_STOR_POS invalid param [E]"},
    {"SUBSCRIBE", "ERROR 2", "SUBSCRIBE no param [E]"},
    {"SUBSCRIBE DUMP", "ERROR 2", "SUBSCRIBE invalid CP type [E]"},
    {"SUBSCRIBE WCN", "ERROR 2", "SUBSCRIBE no <event> [E]"},
    {"SUBSCRIBE WCN DUMPS", "ERROR 2", "SUBSCRIBE invalid <event> [E]"},
    {"SUBSCRIBE WCN DUMP 1", "ERROR 2", "SUBSCRIBE more params than expected [E]"},
    {"SUBSCRIBE WCN DUMP\r", "OK", ""},
    {"UNSUBSCRIBE", "ERROR 2", "UNSUBSCRIBE no param [E]"},
    {"UNSUBSCRIBE WCN DUMP", "OK", ""},
    {"flush", "ERROR 1", "unknown request [E]"},
    {"FLUSHH", "ERROR 1", "unknown request [E]"},
    {" \t\rGET_LOG_FILE_SIZE", "OK 4294967295", "GET_LOG_FILE_SIZE 4294967295"},
};

TEST_F(ClientRequestsTest, EveryRequestRepliesAndLogsAsItShould) {
    Client client(TEST_SERVER);
    talk(client, "FLUSH\n", "OK\n");
    log.clear();
    for (const auto& c : CASES) {
        talk(client, std::string(c.request) + "\n", std::string(c.reply) + "\n");
        EXPECT_EQ(logged(), c.log) << c.request;
    }
    // There is a settings file of the general logger now.
    root.write_file("data/local/tmp/kest/kest.conf", "enable\nstream\tcp_wcdma\ton\n");
    talk(client, "kestctl reload\n", "OK\n");
}

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
    const auto reply_to = [&](const std::string& line) {
        EXPECT_TRUE(client.say(line + "\n"));
        pump([&] { return !client.heard().empty(); });
        const std::string reply = client.heard();
        client.forget();
        return reply;
    };
    for (const ControlRequest& request : CONTROL_REQUESTS) {
        const std::string right = request.words + examples.at(request.params);
        const std::string wrong = std::string(request.keyword()) + (*request.params ? "" : " x");
        const std::regex expected(replies.at(request.reply));
        EXPECT_TRUE(std::regex_match(reply_to(right), expected)) << right;
        EXPECT_TRUE(std::regex_match(reply_to(wrong), std::regex("ERROR [12]\n"))) << wrong;
    }
}

}  // namespace
