// SPDX-License-Identifier: Apache-2.0
// Runs the real kestctl against a scripted service in the test.
#include <linux/sockios.h>
#include <signal.h>
#include <string.h>
#include <sys/wait.h>

#include <set>
#include <sstream>

#include "core/system_paths.h"
#include "sim/ChildProcess.h"
#include "support/devices.h"

namespace {

typedef std::vector<std::string> Strings;

Strings split(const std::string& text, char separator) {
    std::istringstream in(text);
    Strings parts;
    for (std::string part; std::getline(in, part, separator);) {
        parts.push_back(part);
    }
    return parts;
}

class KestctlTest : public ::testing::Test {
protected:
    ~KestctlTest() override { close(m_listen); }

    void start(Strings args, const std::string& out_path = "") {
        args.insert(args.begin(), {"bash", "-c", m_before + "exec \"$@\"", "bash", KESTCTL});
        const std::string out = out_path.empty() ? m_root.path("out") : out_path;
        EXPECT_TRUE(m_process.start({std::move(args), out, m_root.path("err"), false, {}, -1}));
    }

    // The exit status; -1 for a program that a signal ended or that did not end.
    int finish() {
        if (!wait_until([&] { return !m_process.alive(); })) {
            m_process.stop(SIGKILL);
        }
        return WIFEXITED(m_process.status()) ? WEXITSTATUS(m_process.status()) : -1;
    }
    int run(const Strings& args) {
        start(args);
        return finish();
    }
    std::string out() const { return m_root.read_file("out"); }
    std::string err() const { return m_root.read_file("err"); }

    bool connecting(int timeout_ms) {
        struct pollfd pfd = {m_listen, POLLIN, 0};
        return poll(&pfd, 1, timeout_ms) == 1;
    }
    void serve() {
        m_peer =
            std::make_unique<Client>(connecting(60000) ? accept(m_listen, nullptr, nullptr) : -1);
    }
    // The next request with its line feed, or what came before the end.
    std::string receive() {
        wait_until(
            [&] { return m_peer->heard().find('\n') != std::string::npos || m_peer->ended(); });
        const std::string line = m_peer->heard();
        m_peer->forget();
        return line;
    }
    void reply(const std::string& bytes) { EXPECT_TRUE(m_peer->say(bytes)); }

    // Runs a command to its end, answering each of its requests with the next reply, and
    // stores the requests. After the last reply the connection is closed.
    int exchange(const std::string& args, const Strings& replies, const char* out_path = "") {
        m_requests.clear();
        start(split(args, ' '), out_path);
        serve();
        for (const std::string& text : replies) {
            m_requests += receive();
            reply(text);
        }
        m_peer.reset();
        return finish();
    }

    TestRoot m_root;
    std::string m_before;  // what a shell does before it becomes kestctl
    int m_listen =
        socket_local_server(SOCKET_CONTROL, ANDROID_SOCKET_NAMESPACE_ABSTRACT, SOCK_STREAM);
    std::unique_ptr<Client> m_peer;
    ChildProcess m_process;
    std::string m_requests;
};

TEST_F(KestctlTest, CommandsBecomeRequestsInTheServicesSpelling) {
    static const struct {
        const char *typed, *sent, *reply, *printed;
    } CASES[] = {
        {"flush", "FLUSH\n", "OK\n", "OK\n"},
        {"reload", "kestctl reload\n", "OK\n", "OK\n"},
        {"save-sleep-log wcdma", "SAVE_SLEEP_LOG WCDMA\n", "OK\n", "OK\n"},
        {"enable-iq Td", "ENABLE_IQ TD WCDMA\n", "OK\n", "OK\n"},
        {"disable-iq Td wcdma", "DISABLE_IQ TD WCDMA\n", "OK\n", "OK\n"},
        {"disable-log wcdma TDD-LTE fdd-lte 5mode ag-dsp",
         "DISABLE_LOG WCDMA TDD-LTE FDD-LTE 5MODE AG-DSP\n", "OK\n", "OK\n"},
        {"set-sd-max-size 4294967295", "SET_SD_MAX_SIZE 4294967295\n", "OK\n", "OK\n"},
        {"get-sd-max-size", "GET_SD_MAX_SIZE\n", "OK 4294967295\n", "4294967295\n"},
        {"set-md-stor-pos internal", "SET_MD_STOR_POS INTERNAL\n", "OK\n", "OK\n"},
        {"get-log-state wcn", "GET_LOG_STATE WCN\n", "OK ON\n", "ON\n"},
    };
    for (const auto& c : CASES) {
        EXPECT_EQ(exchange(c.typed, {c.reply}), 0) << err();
        EXPECT_EQ(m_requests, c.sent);
        EXPECT_EQ(out(), c.printed);
        EXPECT_EQ(err(), "");
    }
}

TEST_F(KestctlTest, EnableLogTellsWhatIsStillOff) {
    EXPECT_EQ(exchange("enable-log wcn td", {"OK\n", "OK ON\n", "OK ON\n"}), 0) << err();
    EXPECT_EQ(m_requests, "ENABLE_LOG WCN TD\nGET_LOG_STATE WCN\nGET_LOG_STATE TD\n");
    EXPECT_EQ(out() + err(), "OK\n");
    const Strings one_is_off = {"OK\n", "OK OFF\n", "OK ON\n"};
    EXPECT_EQ(exchange("--json enable-log ag-dsp gnss", one_is_off), 6);
    EXPECT_EQ(err().find("kestctl: still off: AG-DSP ("), 0u) << err();
    EXPECT_EQ(out().find("{\"ok\":false,\"status\":6,"), 0u) << out();
    EXPECT_EQ(exchange("enable-log TD", {"ERROR 3\n"}), 13);
    EXPECT_EQ(exchange("enable-log TD", {"OK\n", ""}), 4);
}

TEST_F(KestctlTest, EveryErrorCodeHasItsStatusAndWords) {
    std::set<std::string> meanings;
    for (int code = 1; code <= 10; ++code) {
        const std::string n = std::to_string(code);
        EXPECT_EQ(exchange("--json save-ringbuf WCN", {"ERROR " + n + "\n"}), 10 + code);
        const std::string intro = "kestctl: error " + n + ": ";
        ASSERT_EQ(err().find(intro), 0u) << err();
        const std::string meaning = err().substr(intro.size(), err().find('\n') - intro.size());
        EXPECT_TRUE(meanings.insert(meaning).second) << meaning;
        EXPECT_EQ(out(), "{\"ok\":false,\"code\":" + n + ",\"meaning\":\"" + meaning + "\"}\n");
    }
}

TEST_F(KestctlTest, NonsenseFromTheServiceIsStatus4AndPrintedHarmlessly) {
    static const struct {
        const char* args;
        std::string reply, said;
    } CASES[] = {
        {"flush", "\x1b[2J\"\\\xff\n", "FLUSH: \\x1b[2J\"\\\\\\xff\n"},
        {"flush", std::string("OK\0\n", 4), "OK\\x00"},
        {"get-log-file-size", "OK 4294967296\n", "unexpected reply"},
        {"get-log-state WCN", "OK \n", "unexpected reply"},
        {"flush", "ERROR 0\n", "unexpected reply"},
        {"flush", "", "closed the connection\n"},
        {"flush", "O", "in the middle"},
        {"flush", std::string(257, 'O') + "\n", "too long"},
        {"watch WCN", "OK\nOK\n", "unexpected line"},
    };
    for (const auto& c : CASES) {
        EXPECT_EQ(exchange(c.args, {c.reply}), 4) << c.args << c.reply;
        EXPECT_NE(err().find(c.said), std::string::npos) << err();
    }
    EXPECT_EQ(exchange("--json flush", {"\x1b\"\\\xff\n"}), 4);
    EXPECT_NE(out().find("FLUSH: \\u001b\\\"\\\\\\u00ff\"}\n"), std::string::npos) << out();
}

TEST_F(KestctlTest, NotificationsAndSplitsDoNotHideTheReply) {
    start({"raw", " SUBSCRIBE\tWCN DUMP"});
    serve();
    EXPECT_EQ(receive(), " SUBSCRIBE\tWCN DUMP\n");
    for (char c : std::string("CP_DUMP_START WCN\nCP_DUMP_END WCN\nOK\n")) {
        reply(std::string(1, c));
        EXPECT_TRUE(wait_until([this] {
            int unread = 0;
            return ioctl(m_peer->fd(), SIOCOUTQ, &unread) == 0 && unread == 0;
        }));
    }
    EXPECT_EQ(finish(), 0) << err();
    EXPECT_EQ(out(), "OK\n");
}

TEST_F(KestctlTest, NoReplyAndNoService) {
    EXPECT_EQ(run({"--timeout", "0.2", "flush"}), 3);
    EXPECT_NE(err().find("no reply within 0.2 s"), std::string::npos) << err();
    close(m_listen);
    m_listen = -1;
    EXPECT_EQ(run({"flush", "--json"}), 2);
    EXPECT_NE(out().find("{\"ok\":false,\"status\":2,"), std::string::npos) << out();
    EXPECT_NE(err().find(" kestmodem@" + m_root.root() + " ("), std::string::npos) << err();
}

TEST_F(KestctlTest, WatchPrintsAtOnceUntilInterrupted) {
    start({"watch", "--timeout", "2"});  // ends with the subscription
    serve();
    reply("OK\nCP_DUMP_START WCDMA\nOK\nOK\nOK\nOK\nOK\nOK\nOK\n");
    std::string asked;
    for (const char* cp : {"WCDMA", "TD", "TDD-LTE", "FDD-LTE", "5MODE", "WCN", "GNSS", "AG-DSP"}) {
        asked += std::string("SUBSCRIBE ") + cp + " DUMP\n";
    }
    EXPECT_TRUE(wait_until([&] { return m_peer->heard() == asked; })) << m_peer->heard();
    reply("CP_DUMP_END WCDMA\nCP_DUMP_START W\x07\n");
    EXPECT_TRUE(wait_until([this] {
        return out() == "CP_DUMP_START WCDMA\nCP_DUMP_END WCDMA\nCP_DUMP_START W\\x07\n";
    }));
    EXPECT_FALSE(wait_until([this] { return !err().empty(); }, 2200));
    m_process.signal(SIGINT);
    EXPECT_EQ(finish(), 0);
    EXPECT_EQ(err(), "");
    m_peer.reset();

    EXPECT_EQ(exchange("--json watch wcn gnss", {"OK\n", "OK\nCP_DUMP_END WCN\n"}), 4);
    EXPECT_EQ(m_requests, "SUBSCRIBE WCN DUMP\nSUBSCRIBE GNSS DUMP\n");
    EXPECT_EQ(out().find("{\"event\":\"DUMP_END\",\"cp\":\"WCN\"}\n{\"ok\":false,\"status\":4,"),
              0u)
        << out();
}

TEST_F(KestctlTest, WatchRunsACommandForEachEventInTheirOrder) {
    // The text of the service reaches the command as its parameters, not as a command.
    const std::string action = m_root.path("action"), said = m_root.path("said");
    m_root.write_file("action",
                      "#!/bin/sh\necho \"$#/$1/$2$(cat)\" >>" + said + "\n[ \"$2\" = WCN ]\n");
    ASSERT_EQ(chmod(action.c_str(), 0700), 0);
    m_before = "trap '' CHLD; exec <" + action + ";";  // the parent's, and no input of the action
    const Strings replies = {"OK\nCP_DUMP_START $(id); `id`\nCP_DUMP_END WCN\n"};
    EXPECT_EQ(exchange("watch wcn --time --exec " + action, replies), 4);
    EXPECT_EQ(m_root.read_file("said"), "2/CP_DUMP_START/$(id); `id`\n2/CP_DUMP_END/WCN\n");
    EXPECT_EQ(err().find("kestctl: " + action + ": exit status 1\nkestctl: the service closed"), 0u)
        << err();
    struct tm time;
    const std::string printed = out();
    const char* const rest = strptime(printed.c_str(), "%Y-%m-%dT%H:%M:%S%z", &time);
    EXPECT_TRUE(rest && strncmp(rest, " CP_DUMP_START $(id)", 20) == 0) << out();
    EXPECT_EQ(exchange("watch wcn --exec /nowhere", replies), 4);
    EXPECT_NE(err().find("/nowhere: No such file"), std::string::npos) << err();
}

TEST_F(KestctlTest, StatusAndValuesForPeopleAndAsJson) {
    Strings replies(8, "OK ON\n");
    for (const char* value : {"10", "512", "0", "ENABLE", "INTERNAL"}) {
        replies.push_back(std::string("OK ") + value + "\n");
    }
    replies[6] = "OK OFF\n";
    EXPECT_EQ(exchange("status", replies), 0) << err();
    for (const char* part :
         {"log-file-size    10 MB\ndata-max-size    512 MB\nsd-max-size      0 MB\n",
          "log WCN          ON\nlog GNSS         OFF\nlog AG-DSP       ON\n"}) {
        EXPECT_NE(out().find(part), std::string::npos) << out();
    }
    EXPECT_EQ(exchange("status --json", replies), 0) << err();
    EXPECT_EQ(out().find("{\"ok\":true,\"log_file_size\":10,\"data_max_size\":512,"), 0u) << out();

    // What no request tells is in the settings file, each line as the service takes it.
    static const struct {
        const char* file;  // null: a FIFO, which nobody may wait for
        const char *md, *iq;
    } CASES[] = {
        {"", "DISABLE", "{\"WCDMA\":\"NONE\",\"TD\":\"NONE\","},
        {"minidump enable\nminidump\niq cp_wcdma WCDMA GSM\niq cp_wcdma GSM\n"
         "iq cp_td-scdma LTE GSM\niq\niq cp_lte GSM\niq cp_td-scdma GSM",
         "ENABLE", "{\"WCDMA\":\"GSM WCDMA\",\"TD\":\"GSM\","},
        {"#minidump enable\nminidump on internal\niq cp_wcdma \niq cp_wcdma WCDMA\n", "DISABLE",
         "{\"WCDMA\":\"WCDMA\",\"TD\":\"NONE\","},
        {nullptr, "UNKNOWN", "{\"WCDMA\":\"UNKNOWN\",\"TD\":\"UNKNOWN\","},
    };
    const std::string settings = &PATH_CONFIG_FILE[1];
    for (const auto& c : CASES) {
        m_root.write_file(settings, c.file ? c.file : "");
        if (!c.file) {
            unlink(m_root.path(settings).c_str());
            ASSERT_EQ(mkfifo(m_root.path(settings).c_str(), 0600), 0);
        }
        EXPECT_EQ(exchange("status --json", replies), 0) << err();
        const std::string md = std::string(",\"md\":\"") + c.md + "\",\"log\":{";
        EXPECT_NE(out().find(md), std::string::npos) << out();
        EXPECT_NE(out().find(std::string(",\"iq\":") + c.iq), std::string::npos) << out();
        EXPECT_EQ(err().empty(), c.file != nullptr) << err();
    }
    unlink(m_root.path(settings).c_str());
    EXPECT_EQ(exchange("status", replies), 0) << err();
    EXPECT_NE(out().find("\nmd               UNKNOWN\n"), std::string::npos) << out();
    EXPECT_NE(out().find("\niq TD            UNKNOWN\n"), std::string::npos) << out();
    EXPECT_FALSE(m_root.exists(settings));  // not made either
    EXPECT_EQ(exchange("--json raw X", {"OK \"\\\n"}), 0);
    EXPECT_EQ(out(), "{\"ok\":true,\"value\":\"\\\"\\\\\"}\n");
    EXPECT_EQ(exchange("get-log-file-size", {"OK 10\n"}, "/dev/full"), 5);
    EXPECT_EQ(exchange("watch wcn", {"OK\nCP_DUMP_START WCN\n"}, "/dev/full"), 5);
    EXPECT_EQ(err(), "kestctl: standard output: No space left on device\n");
    m_before = "exec >&-;";  // the number that a socket would then get
    EXPECT_EQ(exchange("get-log-file-size", {"OK 10\n"}), 5);
}

TEST_F(KestctlTest, WrongUsageSendsNothing) {
    std::vector<Strings> cases = {
        {"get-log-state", ""}, {"raw", " \t"}, {"raw", "A\nB"}, {"raw", std::string(256, 'A')}};
    const std::string wrong =
        "|fly|--fly flush|--timeout flush|--timeout -1 flush|--timeout nan flush|--timeout= flush|"
        "flush now|enable-log|enable-log WCN CP|enable-log wcn WCN|"
        "enable-log WCDMA TD TDD-LTE FDD-LTE 5MODE WCN|get-log-state WCN TD|get-log-state WC|"
        "set-log-file-size|set-log-file-size 10MB|set-sd-max-size -1|set-sd-max-size 4294967296|"
        "set-sd-max-size +1|flush --time|watch --exec= wcn|set-md-stor-pos sd|enable-iq WCDMA "
        "GSM|enable-iq|raw";
    for (const std::string& args : split(wrong, '|')) {
        cases.push_back(split(args, ' '));
    }
    for (const Strings& args : cases) {
        EXPECT_EQ(run(args), 1) << ::testing::PrintToString(args);
        EXPECT_EQ(out(), "");
        EXPECT_NE(err().find("usage: kestctl "), std::string::npos) << err();
    }
    static const struct {
        const char *args, *said;
    } WORDS[] = {
        {"fluhs", "unknown command 'fluhs'; see kestctl --help (did you mean 'flush'?)\n"},
        {"ENABLE_LOG",
         "unknown command 'ENABLE_LOG'; see kestctl --help (did you mean 'enable-log'?)\n"},
        {"fly", "unknown command 'fly'; see kestctl --help\n"},
        {"set-sd-max-size 4294967296",
         "'4294967296' is not a whole number of megabytes up to 4294967295\n"},
        {"get-log-state WC", "unknown co-processor 'WC'; expected one of: WCDMA, TD, TDD-LTE, "},
    };
    for (const auto& c : WORDS) {
        EXPECT_EQ(run(split(c.args, ' ')), 1);
        EXPECT_EQ(err().find(std::string("kestctl: ") + c.said), 0u) << err();
    }
    EXPECT_FALSE(connecting(0)) << "none of them has even connected";
    EXPECT_EQ(exchange("raw " + std::string(255, 'A'), {"ERROR 1\n"}), 11);
}

TEST_F(KestctlTest, CompletionKnowsTheTable) {
    EXPECT_EQ(run({"--complete", "get-l"}), 0);
    EXPECT_EQ(out(), "get-log-state\nget-log-file-size\nget-log-overwrite\n");
    EXPECT_EQ(run({"--complete", "--timeout", "=", "5", "enable-log", "wcn", "--json", "W"}), 0);
    EXPECT_EQ(out(), "WCDMA\n");
    EXPECT_EQ(run({"--complete", "get-log-state", "WCN", "W"}), 0);
    EXPECT_EQ(out(), "");
}

}  // namespace
