// Every request in every form, by what the client reads and what is logged.
#include <gtest/gtest.h>

#include <sstream>

#include "client/ControlFixture.h"

namespace {

class ClientRequestsTest : public ControlFixture {
protected:
    ClientRequestsTest() : manager(&ctrl, &mux(), 3) { EXPECT_EQ(manager.init(TEST_SERVER), 0); }

    // What request handlers have logged: "handler: text" a line, "[E]" for errno.
    std::string logged() {
        std::istringstream text(log.text());
        std::string result;
        const std::string mark = "void ClientHandler::";
        for (std::string line; std::getline(text, line);) {
            const size_t name = line.find(mark);
            if (name == std::string::npos || line.find("proc") != name + mark.size()) {
                continue;
            }
            line.erase(0, name + mark.size());
            const size_t args = line.find("(const uint8_t*, size_t): ");
            EXPECT_NE(args, std::string::npos) << line;
            line.replace(args, strlen("(const uint8_t*, size_t)"), "");
            const size_t error = line.rfind(" [");
            if (error != std::string::npos && line.substr(line.size() - 2) == ")]") {
                line.replace(error, std::string::npos, " [E]");
            }
            result += result.empty() ? line : "|" + line;
        }
        log.clear();
        return result;
    }

    ClientManager manager;
};

struct Case {
    const char* request;
    const char* reply;
    const char* log;
};

// In order, on one connection. No log device yields data, no CP but WCDMA and WCN has a
// channel and WCN has no device.
const Case CASES[] = {
    {"GET_LOG_STATE WCDMA", "OK OFF\n", ""},
    {"GET_LOG_STATE GNSS more", "OK OFF\n", ""},
    {"GET_LOG_STATE", "ERROR 2\n", "proc_get_log_state: GET_LOG_STATE no param [E]"},
    {"GET_LOG_STATE cp_wcdma", "ERROR 9\n",
     "proc_get_log_state: GET_LOG_STATE invalid CP type [E]"},

    {"DISABLE_IQ", "ERROR 2\n", "proc_disable_iq: DISABLE_IQ no param [E]"},
    {"DISABLE_IQ X", "ERROR 2\n", "proc_disable_iq: DISABLE_IQ invalid CP type [E]"},
    {"DISABLE_IQ WCDMA GSM", "ERROR 2\n", "proc_disable_iq: DISABLE_IQ unknown I/Q type [E]"},
    {"DISABLE_IQ GNSS", "ERROR 3\n", "proc_disable_iq: disable_iq error -7 [E]"},
    {"DISABLE_IQ WCDMA", "OK\n", ""},
    {"ENABLE_IQ", "ERROR 2\n", "proc_enable_iq: ENABLE_IQ no param [E]"},
    {"ENABLE_IQ wcdma WCDMA", "ERROR 2\n", "proc_enable_iq: ENABLE_IQ invalid CP type [E]"},
    {"ENABLE_IQ WCDMA", "ERROR 2\n", "proc_enable_iq: ENABLE_IQ no I/Q type [E]"},
    {"ENABLE_IQ WCDMA GSM", "ERROR 2\n", "proc_enable_iq: ENABLE_IQ unknown I/Q type [E]"},
    {"ENABLE_IQ 5MODE WCDMA", "ERROR 3\n", "proc_enable_iq: enable_iq error -7 [E]"},
    {"ENABLE_IQ WCDMA WCDMA more", "OK\n", ""},
    // Logging is off: the switch goes off, and the channel reports a failure.
    {"DISABLE_IQ WCDMA WCDMA more", "ERROR 3\n", "proc_disable_iq: disable_iq error -1 [E]"},

    {"SAVE_SLEEP_LOG", "ERROR 2\n",
     "proc_sleep_log: SAVE_SLEEP_LOG|proc_sleep_log: SAVE_SLEEP_LOG no param [E]"},
    {"SAVE_SLEEP_LOG 5", "ERROR 2\n",
     "proc_sleep_log: SAVE_SLEEP_LOG|proc_sleep_log: SAVE_SLEEP_LOG invalid CP type [E]"},
    {"SAVE_SLEEP_LOG WCDMA 1", "ERROR 2\n",
     "proc_sleep_log: SAVE_SLEEP_LOG|proc_sleep_log: SAVE_SLEEP_LOG extra parameter [E]"},
    {"SAVE_SLEEP_LOG AG-DSP", "ERROR 2\n",
     "proc_sleep_log: SAVE_SLEEP_LOG|proc_sleep_log: SAVE_SLEEP_LOG unknown CP [E]"},
    {"SAVE_SLEEP_LOG WCDMA\r", "ERROR 5\n",
     "proc_sleep_log: SAVE_SLEEP_LOG|proc_sleep_log: Save sleep log error -3 [E]"},
    {"SAVE_RINGBUF", "ERROR 2\n",
     "proc_ringbuf: SAVE_RINGBUF|proc_ringbuf: SAVE_RINGBUF no param [E]"},
    {"SAVE_RINGBUF wcn", "ERROR 2\n",
     "proc_ringbuf: SAVE_RINGBUF|proc_ringbuf: SAVE_RINGBUF invalid CP type [E]"},
    {"SAVE_RINGBUF WCN WCN", "ERROR 2\n",
     "proc_ringbuf: SAVE_RINGBUF|proc_ringbuf: SAVE_RINGBUF extra parameter [E]"},
    {"SAVE_RINGBUF TD", "ERROR 2\n",
     "proc_ringbuf: SAVE_RINGBUF|proc_ringbuf: SAVE_RINGBUF unknown CP [E]"},
    {"SAVE_RINGBUF WCN", "ERROR 5\n",
     "proc_ringbuf: SAVE_RINGBUF|proc_ringbuf: Save ringbuf error -3 [E]"},

    {"ENABLE_LOG", "ERROR 2\n", "proc_enable_log: ENABLE_LOG "},
    {"ENABLE_LOG WCDMA WCDMA", "ERROR 2\n", "proc_enable_log: ENABLE_LOG  WCDMA WCDMA"},
    {"ENABLE_LOG WCDMA X", "ERROR 2\n", "proc_enable_log: ENABLE_LOG  WCDMA X"},
    {"ENABLE_LOG WCDMA TD TDD-LTE FDD-LTE 5MODE WCN", "ERROR 2\n",
     "proc_enable_log: ENABLE_LOG  WCDMA TD TDD-LTE FDD-LTE 5MODE WCN"},
    {"GET_LOG_STATE WCDMA", "OK OFF\n", ""},
    {"ENABLE_LOG \t GNSS TD\tTDD-LTE AG-DSP WCDMA\r", "OK\n",
     "proc_enable_log: ENABLE_LOG  \t GNSS TD\tTDD-LTE AG-DSP WCDMA\r"},
    {"GET_LOG_STATE\tWCDMA\r", "OK ON\n", ""},
    {"ENABLE_LOG 5MODE FDD-LTE", "OK\n", "proc_enable_log: ENABLE_LOG  5MODE FDD-LTE"},
    {"DISABLE_LOG", "ERROR 2\n", "proc_disable_log: DISABLE_LOG "},
    {"DISABLE_LOG WCDMA WCN WCDMA", "ERROR 2\n", "proc_disable_log: DISABLE_LOG  WCDMA WCN WCDMA"},
    {"GET_LOG_STATE WCDMA", "OK ON\n", ""},
    {"FLUSH", "OK\n", ""},
    {"FLUSH \t\r", "OK\n", ""},
    {"FLUSH now", "ERROR 1\n", ""},
    {"DISABLE_LOG WCDMA", "OK\n", "proc_disable_log: DISABLE_LOG  WCDMA"},
    {"GET_LOG_STATE WCDMA", "OK OFF\n", ""},

    {"kestctl", "ERROR 1\n", ""},
    {"kestctl Reload", "ERROR 1\n", ""},
    {"kestctl again clear", "ERROR 1\n", ""},
    {"kestctl reload more", "ERROR 3\n", "proc_kestctl: reload kest.conf"},  // there is no file
    {"kestctl clear more", "OK\n", "proc_kestctl: remove CP log"},

    {"SET_LOG_FILE_SIZE", "ERROR 2\n",
     "proc_set_log_file_size: SET_LOG_FILE_SIZE invalid parameter [E]"},
    {"SET_LOG_FILE_SIZE 20MB", "ERROR 2\n",
     "proc_set_log_file_size: SET_LOG_FILE_SIZE invalid size [E]"},
    {"SET_LOG_FILE_SIZE 4294967296", "ERROR 2\n",
     "proc_set_log_file_size: SET_LOG_FILE_SIZE invalid size [E]"},
    {"SET_LOG_FILE_SIZE 18446744073709551617", "ERROR 2\n",
     "proc_set_log_file_size: SET_LOG_FILE_SIZE invalid size [E]"},
    {"SET_LOG_FILE_SIZE 7 8", "ERROR 2\n", "proc_set_log_file_size: SET_LOG_FILE_SIZE 7"},
    {"GET_LOG_FILE_SIZE\r", "OK 5\n", "proc_get_log_file_size: GET_LOG_FILE_SIZE 5"},
    {"SET_LOG_FILE_SIZE 0", "OK\n", "proc_set_log_file_size: SET_LOG_FILE_SIZE 0"},
    {"GET_LOG_FILE_SIZE", "OK 0\n", "proc_get_log_file_size: GET_LOG_FILE_SIZE 0"},
    {"SET_LOG_FILE_SIZE 4294967295\r", "OK\n",
     "proc_set_log_file_size: SET_LOG_FILE_SIZE 4294967295"},
    {"GET_LOG_FILE_SIZE", "OK 4294967295\n",
     "proc_get_log_file_size: GET_LOG_FILE_SIZE 4294967295"},
    {"GET_LOG_FILE_SIZE x", "ERROR 2\n",
     "proc_get_log_file_size: GET_LOG_FILE_SIZE invalid param [E]"},

    {"SET_DATA_MAX_SIZE", "ERROR 2\n", "proc_set_data_part_size: SET_DATA_MAX_SIZE no param [E]"},
    {"SET_DATA_MAX_SIZE -1", "ERROR 2\n",
     "proc_set_data_part_size: SET_DATA_MAX_SIZE invalid param [E]"},
    {"SET_DATA_MAX_SIZE 42949672950", "ERROR 2\n",
     "proc_set_data_part_size: SET_DATA_MAX_SIZE invalid param [E]"},
    {"SET_DATA_MAX_SIZE 1 2", "ERROR 2\n",
     "proc_set_data_part_size: SET_DATA_MAX_SIZE invalid param [E]"},
    {"GET_DATA_MAX_SIZE", "OK 25\n", "proc_get_data_part_size: GET_DATA_MAX_SIZE 25"},
    {"SET_DATA_MAX_SIZE 000000000000000000000000000012", "OK\n",
     "proc_set_data_part_size: SET_DATA_MAX_SIZE 12"},
    {"GET_DATA_MAX_SIZE", "OK 12\n", "proc_get_data_part_size: GET_DATA_MAX_SIZE 12"},
    {"GET_DATA_MAX_SIZE 12", "ERROR 2\n",
     "proc_get_data_part_size: GET_DATA_MAX_SIZE invalid param [E]"},

    {"SET_SD_MAX_SIZE \r", "ERROR 2\n", "proc_set_sd_size: SET_SD_MAX_SIZE no param [E]"},
    {"SET_SD_MAX_SIZE +1", "ERROR 2\n", "proc_set_sd_size: SET_SD_MAX_SIZE invalid size [E]"},
    {"SET_SD_MAX_SIZE 1 MB", "ERROR 2\n", "proc_set_sd_size: SET_SD_MAX_SIZE invalid param [E]"},
    {"GET_SD_MAX_SIZE", "OK 250\n", "proc_get_sd_size: GET_SD_MAX_SIZE 250"},
    {"SET_SD_MAX_SIZE 300", "OK\n", "proc_set_sd_size: SET_SD_MAX_SIZE 300"},
    {"GET_SD_MAX_SIZE", "OK 300\n", "proc_get_sd_size: GET_SD_MAX_SIZE 300"},
    {"GET_SD_MAX_SIZE ?", "ERROR 2\n", "proc_get_sd_size: GET_SD_MAX_SIZE invalid param [E]"},

    {"GET_LOG_OVERWRITE", "OK ENABLE\n", "proc_get_log_overwrite: GET_LOG_OVERWRITE ENABLE"},
    {"DISABLE_LOG_OVERWRITE 1", "ERROR 2\n",
     "proc_disable_overwrite: DISABLE_LOG_OVERWRITE invalid param [E]"},
    {"DISABLE_LOG_OVERWRITE", "OK\n", "proc_disable_overwrite: DISABLE_LOG_OVERWRITE"},
    {"GET_LOG_OVERWRITE", "OK DISABLE\n", "proc_get_log_overwrite: GET_LOG_OVERWRITE DISABLE"},
    {"ENABLE_LOG_OVERWRITE x", "ERROR 2\n",
     "proc_enable_overwrite: ENABLE_LOG_OVERWRITE invalid param [E]"},
    {"ENABLE_LOG_OVERWRITE\r", "OK\n", "proc_enable_overwrite: ENABLE_LOG_OVERWRITE"},
    {"GET_LOG_OVERWRITE", "OK ENABLE\n", "proc_get_log_overwrite: GET_LOG_OVERWRITE ENABLE"},
    {"GET_LOG_OVERWRITE x", "ERROR 2\n",
     "proc_get_log_overwrite: GET_LOG_OVERWRITE invalid param [E]"},

    {"ENABLE_MD", "OK\n", ""},
    {"ENABLE_MD \t ", "OK\n", ""},
    {"ENABLE_MD\r", "ERROR 2\n", ""},
    {"ENABLE_MD x", "ERROR 2\n", ""},
    {"DISABLE_MD ", "OK\n", ""},
    {"DISABLE_MD\r", "ERROR 2\n", ""},
    {"MINI_DUMP", "ERROR 3\n", ""},
    {"MINI_DUMP \r", "ERROR 2\n", ""},

    {"GET_MD_STOR_POS", "OK EXTERNAL\n", "proc_get_md_pos: GET_MD_STOR_POS EXTERNAL."},
    {"SET_MD_STOR_POS", "ERROR 2\n", "proc_set_md_pos: SET_MD_STOR_POS invalid param [E]"},
    {"SET_MD_STOR_POS INTERNAL x", "OK\n", "proc_set_md_pos: SET_MD_STOR_POS: INTERNAL."},
    {"GET_MD_STOR_POS", "OK INTERNAL\n", "proc_get_md_pos: GET_MD_STOR_POS INTERNAL."},
    {"SET_MD_STOR_POS internal", "OK\n", "proc_set_md_pos: SET_MD_STOR_POS: EXTERNAL."},
    {"GET_MD_STOR_POS", "OK EXTERNAL\n", "proc_get_md_pos: GET_MD_STOR_POS EXTERNAL."},
    {"GET_MD_STOR_POS x", "ERROR 2\n", "proc_get_md_pos: GET_MD_STOR_POS invalid param [E]"},

    {"SUBSCRIBE", "ERROR 2\n", "proc_subscribe: SUBSCRIBE no param [E]"},
    {"SUBSCRIBE DUMP", "ERROR 2\n", "proc_subscribe: SUBSCRIBE invalid CP type [E]"},
    {"SUBSCRIBE WCN", "ERROR 2\n", "proc_subscribe: SUBSCRIBE no <event> [E]"},
    {"SUBSCRIBE WCN DUMPS", "ERROR 2\n", "proc_subscribe: SUBSCRIBE invalid <event> [E]"},
    {"SUBSCRIBE WCN DUMP 1", "ERROR 2\n",
     "proc_subscribe: SUBSCRIBE more params than expected [E]"},
    {"SUBSCRIBE WCN DUMP\r", "OK\n", ""},
    {"SUBSCRIBE GNSS DUMP", "OK\n", ""},
    {"UNSUBSCRIBE", "ERROR 2\n", "proc_unsubscribe: UNSUBSCRIBE no param [E]"},
    {"UNSUBSCRIBE x DUMP", "ERROR 2\n", "proc_unsubscribe: UNSUBSCRIBE invalid CP type [E]"},
    {"UNSUBSCRIBE WCN", "ERROR 2\n", "proc_unsubscribe: UNSUBSCRIBE no <event> [E]"},
    {"UNSUBSCRIBE WCN dump", "ERROR 2\n", "proc_unsubscribe: UNSUBSCRIBE invalid <event> [E]"},
    {"UNSUBSCRIBE WCN DUMP x", "ERROR 2\n",
     "proc_unsubscribe: UNSUBSCRIBE more params than expected [E]"},
    {"UNSUBSCRIBE WCN DUMP", "OK\n", ""},

    {"flush", "ERROR 1\n", "process_req: unknown request [E]"},
    {"FLUS", "ERROR 1\n", "process_req: unknown request [E]"},
    {"FLUSHH", "ERROR 1\n", "process_req: unknown request [E]"},
    {"GET_LOG_FILE_SIZES", "ERROR 1\n", "process_req: unknown request [E]"},
    {" \t\rGET_LOG_FILE_SIZE", "OK 4294967295\n",
     "proc_get_log_file_size: GET_LOG_FILE_SIZE 4294967295"},
};

TEST_F(ClientRequestsTest, EveryRequestRepliesAndLogsAsItShould) {
    Peer client(TEST_SERVER);
    ASSERT_EQ(ask(client, "FLUSH\n", "OK\n"), "OK\n");
    log.clear();
    for (const Case& c : CASES) {
        EXPECT_EQ(ask(client, std::string(c.request) + "\n", c.reply), c.reply) << c.request;
        EXPECT_EQ(logged(), c.log) << c.request;
    }
    // The other way round: no request without a case.
    for (const ClientHandler::Request& request : ClientHandler::REQUESTS) {
        const std::string keyword = request.keyword;
        bool tested = false;
        for (const Case& c : CASES) {
            const std::string text = c.request;
            tested = tested || text == keyword ||
                     text.compare(0, keyword.size() + 1, keyword + " ") == 0;
        }
        EXPECT_TRUE(tested) << keyword;
        EXPECT_STRNE(request.help, "") << keyword;
    }
}

TEST_F(ClientRequestsTest, ReloadSucceedsWithASettingsFileOfTheGeneralLogger) {
    root.write_file("data/local/tmp/kest/kest.conf", "enable\nstream\tcp_wcdma\ton\n");
    Peer client(TEST_SERVER);
    EXPECT_EQ(ask(client, "kestctl reload\n", "OK\n"), "OK\n");
    EXPECT_EQ(logged(), "proc_kestctl: reload kest.conf");
}

}  // namespace
