// Runs the real kestctl against a scripted service in the test.
#include <cutils/sockets.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <linux/sockios.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <string.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <fstream>
#include <set>
#include <sstream>

#include "client/ClientHandler.h"
#include "core/system_paths.h"
#include "support/TestRoot.h"

namespace {

typedef std::vector<std::string> Strings;

Strings words(const std::string& text) {
    std::istringstream in(text);
    return Strings(std::istream_iterator<std::string>(in), {});
}

class KestctlTest : public ::testing::Test {
protected:
    KestctlTest()
        : m_listen(socket_local_server(SOCKET_CONTROL, ANDROID_SOCKET_NAMESPACE_ABSTRACT,
                                       SOCK_STREAM)) {}
    ~KestctlTest() override {
        hang_up();
        close(m_listen);
    }

    void start(const Strings& args, const std::string& out = "") {
        const std::string out_path = out.empty() ? m_root.path("out") : out;
        Strings all = {KESTCTL};
        all.insert(all.end(), args.begin(), args.end());
        std::vector<char*> argv;
        for (std::string& arg : all) {
            argv.push_back(&arg[0]);
        }
        argv.push_back(nullptr);
        posix_spawn_file_actions_t fds;
        posix_spawn_file_actions_init(&fds);
        const int flags = O_WRONLY | O_CREAT | O_TRUNC;
        posix_spawn_file_actions_addopen(&fds, 1, out_path.c_str(), flags, 0600);
        posix_spawn_file_actions_addopen(&fds, 2, m_root.path("err").c_str(), flags, 0600);
        ASSERT_EQ(posix_spawn(&m_pid, KESTCTL, &fds, nullptr, argv.data(), environ), 0);
        posix_spawn_file_actions_destroy(&fds);
    }

    // The exit status; -1 for a program that a signal ended or that did not end.
    int finish() {
        int status = -1;
        if (!wait_until([&] { return waitpid(m_pid, &status, WNOHANG) == m_pid; })) {
            kill(m_pid, SIGKILL);
            waitpid(m_pid, &status, 0);
        }
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }
    std::string out() const { return m_root.read_file("out"); }
    std::string err() const { return m_root.read_file("err"); }

    bool readable(int fd) {
        struct pollfd pfd = {fd, POLLIN, 0};
        return poll(&pfd, 1, 10000) == 1;
    }
    void serve() { m_conn = readable(m_listen) ? accept(m_listen, nullptr, nullptr) : -1; }
    void hang_up() {
        if (m_conn >= 0) {
            close(m_conn);
        }
        m_conn = -1;
    }
    // The next request with its line feed, or what came before the end.
    std::string receive() {
        std::string line;
        for (char c; readable(m_conn) && read(m_conn, &c, 1) == 1;) {
            line += c;
            if (c == '\n') {
                break;
            }
        }
        return line;
    }
    void reply(const std::string& bytes) {
        EXPECT_EQ(send(m_conn, bytes.data(), bytes.size(), MSG_NOSIGNAL),
                  static_cast<ssize_t>(bytes.size()));
    }

    // Runs a command to its end, answering each of its requests with the next reply, and
    // stores the requests. After the last reply the connection is closed.
    int exchange(const std::string& args, const Strings& replies) {
        m_requests.clear();
        start(words(args));
        serve();
        for (const std::string& text : replies) {
            m_requests += receive();
            reply(text);
        }
        hang_up();
        return finish();
    }

    TestRoot m_root;
    int m_listen;
    int m_conn = -1;
    pid_t m_pid = -1;
    std::string m_requests;
};

TEST_F(KestctlTest, EveryRequestIsReachedByACommand) {
    static const struct {
        const char *args, *request, *reply, *out;
    } CASES[] = {
        {"flush", "FLUSH", "OK", "OK"},
        {"reload", "kestctl reload", "OK", "OK"},
        {"clear", "kestctl clear", "OK", "OK"},
        {"enable-iq wcdma", "ENABLE_IQ WCDMA WCDMA", "OK", "OK"},
        {"disable-iq Td WCDMA", "DISABLE_IQ TD WCDMA", "OK", "OK"},
        {"enable-md", "ENABLE_MD", "OK", "OK"},
        {"disable-md", "DISABLE_MD", "OK", "OK"},
        {"mini-dump", "MINI_DUMP", "OK", "OK"},
        {"enable-log wcdma TDD-LTE fdd-lte 5mode ag-dsp",
         "ENABLE_LOG WCDMA TDD-LTE FDD-LTE 5MODE AG-DSP", "OK", "OK"},
        {"disable-log gnss WCN", "DISABLE_LOG GNSS WCN", "OK", "OK"},
        {"get-log-state wcn", "GET_LOG_STATE WCN", "OK ON", "ON"},
        {"save-ringbuf wcdma", "SAVE_RINGBUF WCDMA", "OK", "OK"},
        {"save-sleep-log wcdma", "SAVE_SLEEP_LOG WCDMA", "OK", "OK"},
        {"get-log-file-size", "GET_LOG_FILE_SIZE", "OK 10", "10"},
        {"set-log-file-size 4294967295", "SET_LOG_FILE_SIZE 4294967295", "OK", "OK"},
        {"get-data-max-size", "GET_DATA_MAX_SIZE", "OK 0", "0"},
        {"set-data-max-size 0", "SET_DATA_MAX_SIZE 0", "OK", "OK"},
        {"get-sd-max-size", "GET_SD_MAX_SIZE", "OK 4294967295", "4294967295"},
        {"set-sd-max-size 7", "SET_SD_MAX_SIZE 7", "OK", "OK"},
        {"get-md-stor-pos", "GET_MD_STOR_POS", "OK INTERNAL", "INTERNAL"},
        {"set-md-stor-pos internal", "SET_MD_STOR_POS INTERNAL", "OK", "OK"},
        {"set-md-stor-pos EXTERNAL", "SET_MD_STOR_POS EXTERNAL", "OK", "OK"},
        {"get-log-overwrite", "GET_LOG_OVERWRITE", "OK DISABLE", "DISABLE"},
        {"enable-log-overwrite", "ENABLE_LOG_OVERWRITE", "OK", "OK"},
        {"disable-log-overwrite", "DISABLE_LOG_OVERWRITE", "OK", "OK"},
        {"raw GET_LOG_STATE", "GET_LOG_STATE", "OK OFF", "OK OFF"},
    };
    // No use on a connection that ends; watch is tested below.
    std::set<std::string> reached = {"SUBSCRIBE", "UNSUBSCRIBE"};
    for (const auto& c : CASES) {
        EXPECT_EQ(exchange(c.args, {std::string(c.reply) + "\n"}), 0) << c.args << err();
        EXPECT_EQ(m_requests, std::string(c.request) + "\n");
        EXPECT_EQ(out(), std::string(c.out) + "\n");
        EXPECT_EQ(err(), "");
        reached.insert(words(c.request)[0]);
    }
    for (const ClientHandler::Request& request : ClientHandler::REQUESTS) {
        EXPECT_EQ(reached.count(request.keyword), 1u) << request.keyword;
    }
}

TEST_F(KestctlTest, EveryErrorCodeHasItsStatusAndWords) {
    std::set<std::string> meanings;
    for (int code = 1; code <= 10; ++code) {
        const std::string n = std::to_string(code);
        EXPECT_EQ(exchange("--json save-ringbuf WCN", {"ERROR " + n + "\n"}), 10 + code);
        const std::string intro = "kestctl: error " + n + ": ";
        ASSERT_EQ(err().find(intro), 0u) << err();
        const std::string meaning = err().substr(intro.size(), err().size() - intro.size() - 1);
        EXPECT_TRUE(meanings.insert(meaning).second) << meaning;
        EXPECT_EQ(out(), "{\"ok\":false,\"code\":" + n + ",\"meaning\":\"" + meaning + "\"}\n");
        EXPECT_EQ(exchange("raw FOO", {"ERROR " + n + "\n"}), 10 + code);
        EXPECT_EQ(out(), "ERROR " + n + "\n");
    }
}

TEST_F(KestctlTest, NonsenseFromTheServiceIsStatus4AndPrintedHarmlessly) {
    static const struct {
        const char* args;
        std::string reply, said;
    } CASES[] = {
        {"flush", "\x1b[2J\"\\\xff\n", "FLUSH: \\x1b[2J\"\\\\\\xff\n"},
        {"flush", "OK 5\n", "unexpected reply"},
        {"flush", "ok\n", "unexpected reply"},
        {"flush", "\n", "unexpected reply"},
        {"flush", std::string("OK\0\n", 4), "OK\\x00"},
        {"get-log-file-size", "OK\n", "unexpected reply"},
        {"get-log-file-size", "OK 12x\n", "unexpected reply"},
        {"get-log-file-size", "OK 4294967296\n", "unexpected reply"},
        {"get-log-state WCN", "OK \n", "unexpected reply"},
        {"flush", "ERROR 0\n", "unexpected reply"},
        {"flush", "ERROR -1\n", "unexpected reply"},
        {"flush", "ERROR 246\n", "unexpected reply"},
        {"flush", "ERROR\n", "unexpected reply"},
        {"raw FLUSH", "HM\n", "unexpected reply"},
        {"flush", "", "closed the connection\n"},
        {"flush", "O", "in the middle"},
        {"flush", std::string(257, 'O') + "\n", "too long"},
        {"flush", std::string(3000, 'O'), "too long"},
        {"status", "OK 1\n", "closed the connection\n"},
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
        // Each byte is a read of its own.
        EXPECT_TRUE(wait_until([this] {
            int unread = 0;
            return ioctl(m_conn, SIOCOUTQ, &unread) == 0 && unread == 0;
        }));
    }
    EXPECT_EQ(finish(), 0) << err();
    EXPECT_EQ(out(), "OK\n");
}

TEST_F(KestctlTest, TimesOutWaitingForAReplyOrForAConnection) {
    std::vector<int> clients;  // fill the queue of clients that nobody accepts
    for (int fd; (fd = socket_local_client(SOCKET_CONTROL, ANDROID_SOCKET_NAMESPACE_ABSTRACT,
                                           SOCK_STREAM | SOCK_NONBLOCK)) >= 0;) {
        clients.push_back(fd);
        if (clients.size() > 1) {
            continue;
        }
        start({"--timeout", "0.2", "flush"});
        EXPECT_EQ(finish(), 3);
        EXPECT_NE(err().find("no reply within 0.2 s"), std::string::npos) << err();
        EXPECT_NE(err().find("three clients"), std::string::npos) << err();
    }
    start({"flush", "--timeout=0.2"});
    EXPECT_EQ(finish(), 3) << err();
    for (int fd : clients) {
        close(fd);
    }
    close(m_listen);
    m_listen = -1;
    start({"flush", "--json"});
    EXPECT_EQ(finish(), 2);
    EXPECT_NE(out().find("{\"ok\":false,\"status\":2,"), std::string::npos) << out();
}

TEST_F(KestctlTest, WatchPrintsAtOnceUntilInterrupted) {
    static const char* const CPS[] = {"WCDMA", "TD",  "TDD-LTE", "FDD-LTE",
                                      "5MODE", "WCN", "GNSS",    "AG-DSP"};
    start({"watch", "--timeout", "5"});
    serve();
    for (const char* cp : CPS) {
        EXPECT_EQ(receive(), std::string("SUBSCRIBE ") + cp + " DUMP\n");
        reply(strcmp(cp, "TD") == 0 ? "CP_DUMP_START WCDMA\nOK\n" : "OK\n");
    }
    EXPECT_TRUE(wait_until([this] { return out() == "CP_DUMP_START WCDMA\n"; }));
    reply("CP_DUMP_END WCDMA\nCP_DUMP_START W\x07\n");
    EXPECT_TRUE(wait_until([this] {
        return out() == "CP_DUMP_START WCDMA\nCP_DUMP_END WCDMA\nCP_DUMP_START W\\x07\n";
    }));
    kill(m_pid, SIGINT);
    EXPECT_EQ(finish(), 0);
    EXPECT_EQ(err(), "");
    hang_up();

    // The time-out ends with the subscription.
    start({"watch", "WCN", "--timeout", "2"});
    serve();
    EXPECT_EQ(receive(), "SUBSCRIBE WCN DUMP\n");
    reply("OK\n");
    EXPECT_FALSE(wait_until([this] { return !err().empty(); }, 2200));
    kill(m_pid, SIGINT);
    EXPECT_EQ(finish(), 0);
    hang_up();

    EXPECT_EQ(exchange("--json watch wcn gnss", {"OK\n", "OK\nCP_DUMP_END WCN\n"}), 4);
    EXPECT_EQ(m_requests, "SUBSCRIBE WCN DUMP\nSUBSCRIBE GNSS DUMP\n");
    EXPECT_EQ(err(), "kestctl: the service closed the connection\n");
    EXPECT_EQ(out(),
              "{\"event\":\"DUMP_END\",\"cp\":\"WCN\"}\n"
              "{\"ok\":false,\"status\":4,\"meaning\":\"the service closed the "
              "connection\"}\n");
}

TEST_F(KestctlTest, StatusAndValuesForPeopleAndAsJson) {
    const Strings replies = {"OK ON\n", "OK OFF\n",    "OK OFF\n",     "OK OFF\n", "OK OFF\n",
                             "OK ON\n", "OK OFF\n",    "OK OFF\n",     "OK 10\n",  "OK 512\n",
                             "OK 0\n",  "OK ENABLE\n", "OK INTERNAL\n"};
    EXPECT_EQ(exchange("status", replies), 0) << err();
    EXPECT_EQ(out(),
              "log-file-size    10 MB\ndata-max-size    512 MB\nsd-max-size      0 MB\n"
              "log-overwrite    ENABLE\nmd-stor-pos      INTERNAL\nlog WCDMA        ON\n"
              "log TD           OFF\nlog TDD-LTE      OFF\nlog FDD-LTE      OFF\n"
              "log 5MODE        OFF\nlog WCN          ON\nlog GNSS         OFF\n"
              "log AG-DSP       OFF\n");
    EXPECT_EQ(exchange("status --json", replies), 0) << err();
    EXPECT_EQ(out(),
              "{\"ok\":true,\"log_file_size\":10,\"data_max_size\":512,\"sd_max_size\":0,"
              "\"log_overwrite\":\"ENABLE\",\"md_stor_pos\":\"INTERNAL\",\"log\":{"
              "\"WCDMA\":\"ON\",\"TD\":\"OFF\",\"TDD-LTE\":\"OFF\",\"FDD-LTE\":\"OFF\","
              "\"5MODE\":\"OFF\",\"WCN\":\"ON\",\"GNSS\":\"OFF\",\"AG-DSP\":\"OFF\"}}\n");
    EXPECT_EQ(exchange("status", {"OK ON\n", "ERROR 9\n"}), 19);
    EXPECT_EQ(out(), "");
    EXPECT_EQ(exchange("--json get-log-file-size", {"OK 10\n"}), 0);
    EXPECT_EQ(out(), "{\"ok\":true,\"value\":10}\n");
    EXPECT_EQ(exchange("--json raw X", {"OK \"\\\n"}), 0);
    EXPECT_EQ(out(), "{\"ok\":true,\"value\":\"\\\"\\\\\"}\n");
    EXPECT_EQ(exchange("--json flush", {"OK\n"}), 0);
    EXPECT_EQ(out(), "{\"ok\":true}\n");

    start({"get-log-file-size"}, "/dev/full");
    serve();
    receive();
    reply("OK 10\n");
    EXPECT_EQ(finish(), 5);
}

TEST_F(KestctlTest, WrongUsageSendsNothing) {
    const Strings CASES[] = {
        {},
        {"fly"},
        {"--fly", "flush"},
        {"--timeout", "flush"},
        {"--timeout", "-1", "flush"},
        {"--timeout", "nan", "flush"},
        {"--timeout=", "flush"},
        {"flush", "now"},
        {"enable-log"},
        {"enable-log", "WCN", "CP"},
        {"enable-log", "wcn", "WCN"},
        {"enable-log", "WCDMA", "TD", "TDD-LTE", "FDD-LTE", "5MODE", "WCN"},
        {"get-log-state", "WCN", "TD"},
        {"get-log-state", ""},
        {"get-log-state", "WC"},
        {"set-log-file-size"},
        {"set-log-file-size", "10MB"},
        {"set-log-file-size", "-1"},
        {"set-sd-max-size", "4294967296"},
        {"set-sd-max-size", ""},
        {"set-sd-max-size", "+1"},
        {"set-md-stor-pos", "sd"},
        {"enable-iq", "WCDMA", "GSM"},
        {"enable-iq"},
        {"raw"},
        {"raw", " \t"},
        {"raw", "A\nB"},
        {"raw", std::string(256, 'A')},
    };
    for (const Strings& args : CASES) {
        start(args);
        EXPECT_EQ(finish(), 1) << ::testing::PrintToString(args);
        EXPECT_EQ(out(), "");
        EXPECT_NE(err().find("usage: kestctl "), std::string::npos) << err();
    }
    struct pollfd pfd = {m_listen, POLLIN, 0};
    EXPECT_EQ(poll(&pfd, 1, 0), 0);  // none of them has even connected
    start({"raw", std::string(255, 'A')});
    serve();
    EXPECT_EQ(receive(), std::string(255, 'A') + "\n");
    reply("ERROR 1\n");
    EXPECT_EQ(finish(), 11);
}

TEST_F(KestctlTest, CompletionHelpAndManualKnowTheTable) {
    static const struct {
        Strings words;
        const char* out;
    } CASES[] = {
        {{"get-l"}, "get-log-state\nget-log-file-size\nget-log-overwrite\n"},
        {{"--json", "--timeout", "5", "fl"}, "flush\n"},
        {{"--t"}, "--timeout\n"},
        {{"--timeout", ""}, ""},
        {{"get-log-state", "w"}, "WCDMA\nWCN\n"},
        {{"get-log-state", "WCN", ""}, ""},
        {{"enable-log", "wcn", "--json", "W"}, "WCDMA\n"},
        {{"set-md-stor-pos", ""}, "INTERNAL\nEXTERNAL\n"},
        {{"enable-iq", "WCDMA", ""}, "WCDMA\n"},
        {{"fly", ""}, ""},
        {{"raw", ""}, ""},
    };
    for (const auto& c : CASES) {
        Strings args = {"--complete"};
        args.insert(args.end(), c.words.begin(), c.words.end());
        start(args);
        EXPECT_EQ(finish(), 0);
        EXPECT_EQ(out(), c.out) << ::testing::PrintToString(args);
    }
    std::ifstream file(SOURCE_DIR "/docs/man/kestctl.1");
    std::set<std::string> in_manual;  // second words of lines like ".BI raw ..."
    for (std::string line; std::getline(file, line);) {
        const Strings parts = words(line);
        if (parts.size() > 1 && parts[0].find(".B") == 0) {
            in_manual.insert(parts[1]);
        }
    }
    start({"--complete", ""});
    EXPECT_EQ(finish(), 0);
    const Strings commands = words(out());
    EXPECT_EQ(commands.size(), 27u);
    start({"--help"});
    EXPECT_EQ(finish(), 0);
    for (const std::string& command : commands) {
        EXPECT_NE(out().find("\n  " + command + " "), std::string::npos) << command;
        EXPECT_EQ(in_manual.count(command), 1u) << command;
    }
    if (access("/bin/bash", X_OK) == 0) {
        const std::string script = ". " SOURCE_DIR
                                   "/tools/completion/kestctl.bash; "
                                   "COMP_WORDS=(" KESTCTL
                                   " enable-log td x); COMP_CWORD=2; "
                                   "_kestctl " KESTCTL " td enable-log; echo ${COMPREPLY[*]} >";
        EXPECT_EQ(system(("/bin/bash -c '" + script + m_root.path("out") + "'").c_str()), 0);
        EXPECT_EQ(out(), "TD TDD-LTE\n");
    }
}

}  // namespace
