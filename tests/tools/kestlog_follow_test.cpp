// SPDX-License-Identifier: Apache-2.0
// Runs the real kestlog follow, at a pipe and in a terminal, beside the real service and beside
// changes of the test's own.
#include <fcntl.h>
#include <pty.h>
#include <signal.h>
#include <sys/ioctl.h>
#include <sys/wait.h>
#include <termios.h>

#include <filesystem>
#include <fstream>
#include <regex>

#include "channels/DspChunkHeader.h"
#include "sim/ServiceProcess.h"
#include "sim/SimControlClient.h"
#include "sim/SimDiagResponder.h"
#include "sim/SimHandset.h"
#include "sim/SimSupervisor.h"
#include "sim/kernel_files.h"
#include "support/TestRoot.h"
#include "support/wire.h"

namespace {

const std::string SET = "modem_log/2016-03-01-09-15-00/";
const std::string WCN = SET + "cp_wcn/";
const std::string DSP = SET + "agdsp/";

// kestlog, and what it has printed so far.
class Following {
public:
    Following(const std::vector<std::string>& args, bool terminal) {
        int pipe_fds[2] = {-1, -1};
        struct winsize size = {10, 60, 0, 0};
        if (terminal) {
            m_pid = forkpty(&m_fd, nullptr, nullptr, &size);
        } else {
            EXPECT_EQ(pipe2(pipe_fds, O_CLOEXEC), 0);
            m_pid = fork();
        }
        if (m_pid == 0) {
            setenv("TERM", "xterm", 1);
            if (!terminal) {
                dup2(pipe_fds[1], STDOUT_FILENO);
            }
            std::vector<std::string> line = args;
            execvp(line[0].c_str(), argv_of(line).data());
            _exit(127);
        }
        if (!terminal) {
            close(pipe_fds[1]);
            m_fd = pipe_fds[0];
        }
        fcntl(m_fd, F_SETFL, O_NONBLOCK);
    }
    ~Following() {
        if (m_pid > 0) {
            kill(m_pid, SIGKILL);
            finish();
        }
        close_pipe();
    }

    // Whether it prints what the pattern matches, after what the last one matched.
    bool says(const std::string& pattern) {
        std::smatch match;
        const bool found = wait_until([&] {
            read_more();
            return std::regex_search(m_text.cbegin() + m_seen, m_text.cend(), match,
                                     std::regex(pattern));
        });
        EXPECT_TRUE(found) << pattern << "\n" << m_text.substr(static_cast<size_t>(m_seen));
        m_seen += found ? match.position() + match.length() : 0;
        return found;
    }
    void type(const std::string& keys) const {
        EXPECT_EQ(write(m_fd, keys.data(), keys.size()), static_cast<ssize_t>(keys.size()));
    }
    void send(int signo) const {
        ASSERT_GT(m_pid, 0);
        EXPECT_EQ(kill(m_pid, signo), 0);
    }
    void close_pipe() {
        if (m_fd >= 0) {
            close(m_fd);
        }
        m_fd = -1;
    }
    // The exit status, -1 after a signal.
    int finish() {
        int status = 0;
        // A pid below 1 would mean other processes.
        const bool ended = m_pid > 0 && wait_until([&] {
                               read_more();
                               return waitpid(m_pid, &status, WNOHANG) == m_pid;
                           });
        EXPECT_TRUE(ended);
        read_more();
        m_pid = -1;
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }
    const std::string& text() const { return m_text; }
    int fd() const { return m_fd; }

private:
    void read_more() {
        char buf[4096];
        for (ssize_t n; m_fd >= 0 && (n = read(m_fd, buf, sizeof(buf))) > 0;) {
            m_text.append(buf, static_cast<size_t>(n));
        }
    }

    pid_t m_pid = -1;
    int m_fd = -1;
    std::string m_text;
    ptrdiff_t m_seen = 0;
};

std::string event(const std::string& name, const std::string& more) {
    return "\\{\"event\":\"" + name + "\",\"time\":\"[-0-9: ]{19}\"[^\\n]*" + more +
           "[^\\n]*\\}\\n";
}

// A modem logs, crashes, and loses its card.
TEST(KestlogFollowTest, TheServicesOwnLifeIsTold) {
    SimHandset handset;
    ASSERT_TRUE(handset.create("")) << handset.error();
    SimCp* const modem = handset.add_cp("cp_wcdma");
    ASSERT_TRUE(modem && handset.insert_sd() && make_kernel_files(handset.root()));
    SimSupervisor supervisor;
    ASSERT_TRUE(supervisor.start("modemd", handset.root()));
    SimDiagResponder diag(modem->diag, 1);
    diag.start();
    Following follow({KESTLOG, "--json", "follow", handset.root()}, false);
    EXPECT_TRUE(follow.says(event("ready", "\"sets\":0,\"files\":0")));

    ServiceProcess service;
    SimControlClient client;
    ASSERT_TRUE(service.start(KESTMODEM_BIN, handset));
    ASSERT_TRUE(client.connect(handset.root(), 60000));
    EXPECT_EQ(client.request("ENABLE_MD", 60000), "OK");
    const auto log_until = [&](const std::string& pattern) {
        for (uint64_t end = modem->fed + (5 << 19); modem->fed < end;) {
            modem->feed(65536);
            EXPECT_TRUE(modem->log.wait_drained(60000));
        }
        return follow.says(pattern);
    };
    EXPECT_TRUE(log_until(event("set", "\"medium\":\"card\"")));
    EXPECT_TRUE(follow.says(event("file", "\"cp\":\"cp_wcdma\",\"file\":\"0-cp_wcdma-")));
    EXPECT_TRUE(follow.says(event("rotation", "\"before_size\":1[0-9]{6}")));
    EXPECT_TRUE(wait_until([&] { return supervisor.connected(); }));
    supervisor.send("Modem Assert: simulated");
    EXPECT_TRUE(follow.says(event("crash", "\"kind\":\"memory dump\".*\"begins\"")));
    EXPECT_TRUE(follow.says(event("crash", "_memory_.*\"size\":6[0-9]{4},\"state\":\"complete\"")));
    for (const char* kind : {"mini dump", "IPC record"}) {
        EXPECT_NE(follow.text().find("\"kind\":\"" + std::string(kind) + "\""), std::string::npos);
    }
    supervisor.send("Modem Alive");
    ASSERT_TRUE(handset.remove_sd());
    const std::filesystem::path card = handset.sd_root();
    std::filesystem::rename(card, card.string() + ".pulled");
    EXPECT_TRUE(follow.says(event("gone", "sdcard0/modem_log\"")));
    EXPECT_TRUE(log_until(event("set", "\"medium\":\"internal\"")));
    EXPECT_TRUE(follow.says(event("file", "\"medium\":\"internal\".*\"file\":\"0-cp_wcdma-")));
    std::filesystem::rename(card.string() + ".pulled", card);
    EXPECT_TRUE(follow.says(event("root", "sdcard0/modem_log\"")));
    service.stop();
    follow.send(SIGTERM);
    EXPECT_EQ(follow.finish(), 0);
    EXPECT_EQ(follow.text().find("\"damage\""), std::string::npos) << follow.text();
    EXPECT_EQ(occurrences(follow.text(), "\"event\":\"set\""), 2u) << follow.text();
    handset.remove_root();
}

class KestlogFollowTreeTest : public testing::Test {
protected:
    void rename(const std::string& from, const std::string& to) const {
        std::filesystem::rename(m_root.path(from), m_root.path(to));
    }
    TestRoot m_root;
};

TEST_F(KestlogFollowTreeTest, FilesOfOthersDamageAndLostDirectories) {
    const std::string cut = chunk(7, LOG, "data").substr(0, 22);
    m_root.write_file("h/" + DSP + "0-agdsp-2016-03-01_09-15-00.log",
                      "no chunk: not new, not told");
    m_root.write_file("h/" + WCN + "cp_wcn.version", "v");
    Following follow({KESTLOG, "--json", "follow", m_root.path("h")}, false);
    EXPECT_TRUE(follow.says(event("ready", "\"sets\":1,\"files\":2,\"size\":28")));
    // Counted up by the service; the closed one ends within a chunk.
    m_root.write_file("h/" + DSP + "1-agdsp-2016-03-01_09-00-00.log", cut);
    EXPECT_TRUE(
        follow.says(event("damage", "\"code\":\"cut\",\"meaning\":\"the last chunk is cut off")));
    // A copy of a set is in progress: it is no damage that the rest is still to come.
    m_root.write_file("copy/agdsp/1-agdsp-2016-03-02_09-00-00.log", cut);
    rename("copy", "h/modem_log/2016-03-02-09-00-00");
    EXPECT_TRUE(follow.says(event("set", "\"2016-03-02-09-00-00\"")));
    m_root.write_file("h/modem_log/2016-03-02-09-00-00/agdsp/1-agdsp-2016-03-02_09-00-00.log",
                      chunk(7, LOG, "data"));
    // What copies a tree gives a file its name at the end.
    m_root.write_file("h/" + DSP + "._thumb", "x");
    follow.send(SIGSTOP);  // by the time it looks, the first name is gone
    m_root.write_file("h/" + WCN + ".2-cp.part", "x");
    rename("h/" + WCN + ".2-cp.part", "h/" + WCN + "2-cp_wcn-2016-03-01_09-00-00.log");
    m_root.write_file("h/" + WCN + "3.part", "x");
    rename("h/" + WCN + "3.part", "h/" + WCN + "._3");  // which is left out
    follow.send(SIGCONT);
    EXPECT_TRUE(follow.says(event(
        "file", "\"file\":\"2-cp_wcn-2016-03-01_09-00-00.log\",\"kind\":\"log\",\"size\":1")));
    rename("h/" + WCN + "2-cp_wcn-2016-03-01_09-00-00.log",
           "h/" + WCN + "3-cp_wcn-2016-03-01_09-00-00.log");
    m_root.write_file("h/" + WCN + "cp_wcn_memory_2016-03-01_09-15-00.dmp", "x");
    EXPECT_TRUE(follow.says(event("crash", "\"begins\"")));
    m_root.write_file("h/" + WCN + "a\x1b[2J", "x");
    std::filesystem::remove(m_root.path("h/" + WCN + "3-cp_wcn-2016-03-01_09-00-00.log"));
    EXPECT_TRUE(follow.says(
        event("deleted", "\"files\":1,\"size\":1,\"file\":\"3-cp_wcn-2016-03-01_09-00-00.log\"")));
    // The whole root goes, comes back as it was, with a second medium, and loses it.
    rename("h", "elsewhere");
    EXPECT_TRUE(follow.says(event("gone", "/h\"")));
    rename("elsewhere", "h");
    EXPECT_TRUE(follow.says(event("root", "/h\"")));
    m_root.write_file("h/storage/sdcard0/kest/" + WCN + "cp_wcn.version", "v");
    EXPECT_TRUE(follow.says(event("root", "sdcard0/kest/modem_log\"")));
    EXPECT_TRUE(follow.says(event("set", "\"medium\":\"(card|h card)\"")));
    EXPECT_TRUE(follow.says(event("file", "\"kind\":\"version\"")));
    std::filesystem::remove_all(m_root.path("h/storage"));
    EXPECT_TRUE(follow.says(event("gone", "sdcard0/kest/modem_log\"")));
    follow.send(SIGINT);
    EXPECT_EQ(follow.finish(), 0);
    EXPECT_TRUE(follow.says(event("damage", "a\\\\u001b\\[2J.*\"code\":\"name\"")));
    EXPECT_EQ(occurrences(follow.text(), "2-cp_wcn"), 1u) << follow.text();
    EXPECT_EQ(occurrences(follow.text(), "\"damage\":true"), 2u) << follow.text();
}

TEST_F(KestlogFollowTreeTest, ADumpInTheLogOfAnAudioDspIsTold) {
    const std::string stem = DSP + "0-agdsp-2016-03-01_09-15-00.log";
    const std::string full(DSP_CHUNK_MAX_DATA, 'd');
    const std::string end = chunk(4, DUMP, "end");
    m_root.write_file(stem, chunk(0, DUMP, "not new"));
    Following follow({KESTLOG, "--json", "follow", m_root.path("modem_log")}, false);
    EXPECT_TRUE(follow.says(event("ready", "\"files\":1")));
    std::ofstream(m_root.path(stem), std::ios::app) << chunk(1, DUMP, full);
    EXPECT_TRUE(follow.says(
        event("crash", "\"cp\":\"agdsp\".*\"memory dump\",\"size\":0,\"state\":\"begins\"")));
    // It goes on in the next file, whose last chunk is not whole at first.
    follow.send(SIGSTOP);
    rename(stem, DSP + "1-agdsp-2016-03-01_09-15-00.log");
    std::ofstream next(m_root.path(DSP + "0-agdsp-2016-03-01_09-16-00.log"));
    next << chunk(2, DUMP, full) << chunk(3, LOG, "in between") << end.substr(0, 21) << std::flush;
    follow.send(SIGCONT);
    EXPECT_TRUE(follow.says(event("rotation", "\"cp\":\"agdsp\"")));
    next << end.substr(21) << std::flush;
    EXPECT_TRUE(follow.says(
        event("crash", "0-agdsp-2016-03-01_09-16-00.*\"size\":65499,\"state\":\"complete\"")));
    // One ends in a gap, one follows what is no chunk and goes on in the next set.
    next << chunk(5, DUMP, full) << chunk(7, LOG, "") << "no chunk, and longer than its header"
         << chunk(8, DUMP, full) << std::flush;
    EXPECT_TRUE(follow.says(event("crash", "\"begins\"")));
    EXPECT_TRUE(follow.says(event("crash", "\"begins\"")));
    m_root.write_file("modem_log/2016-03-01-09-17-00/agdsp/0-agdsp-2016-03-01_09-17-00.log",
                      chunk(9, DUMP, "end"));
    EXPECT_TRUE(follow.says(event("crash", "09-17-00.*\"size\":32751,\"state\":\"complete\"")));
    follow.send(SIGINT);
    EXPECT_EQ(follow.finish(), 0);
    EXPECT_EQ(occurrences(follow.text(), "\"crash\""), 5u) << follow.text();
}

// By the time it looks, the service has counted up further.
TEST_F(KestlogFollowTreeTest, ASizeThatIsNotKnownIsNotTold) {
    const auto log = [](int number, int begun) {
        return WCN + std::to_string(number) + "-cp_wcn-2016-03-01_09-1" + std::to_string(begun) +
               "-00.log";
    };
    m_root.make_dir("modem_log");  // without a set at first
    Following first({KESTLOG, "follow", m_root.path("modem_log")}, false);
    EXPECT_TRUE(first.says("following 0 sets"));
    m_root.write_file(log(0, 0), "x");
    EXPECT_TRUE(first.says("new set: 2016-03-01-09-15-00"));
    Following follow({KESTLOG, "follow", m_root.path("modem_log")}, false);
    EXPECT_TRUE(follow.says("following 1 set"));
    follow.send(SIGSTOP);
    for (int last = 1; last <= 3; ++last) {
        for (int begun = 0; begun < last; ++begun) {
            rename(log(last - begun - 1, begun), log(last - begun, begun));
        }
        m_root.write_file(log(0, last), "full");
    }
    follow.send(SIGCONT);
    EXPECT_TRUE(follow.says("_09-12-00.log follows 1-cp_wcn-2016-03-01_09-11-00.log\n"));
    EXPECT_TRUE(follow.says("_09-13-00.log follows 1-cp_wcn-2016-03-01_09-12-00.log, 4 bytes\n"));
}

TEST_F(KestlogFollowTreeTest, TheKernelsLimits) {
    m_root.write_file(WCN + "0-cp_wcn-2016-03-01_09-15-00.log", "x");
    Following follow({KESTLOG, "follow", m_root.path("modem_log")}, false);
    EXPECT_TRUE(follow.says("following 1 set, 1 file \\(1 bytes\\)\n"));
    follow.send(SIGSTOP);
    // More renamings than the queue of changes holds.
    const std::string limit = "/proc/sys/fs/inotify/max_queued_events";
    unsigned count = 0;
    std::ifstream(limit) >> count;
    ASSERT_GT(count, 0u);
    if (count > 100000) {
        GTEST_SKIP() << limit << " is " << count;
    }
    for (unsigned i = 0; i < count; ++i) {
        const std::string stem = "-cp_wcn-2016-03-01_09-15-00.log";
        rename(WCN + std::to_string(i) + stem, WCN + std::to_string(i + 1) + stem);
    }
    m_root.write_file(WCN + "0-cp_wcn-2016-03-01_09-16-00.log", "y");
    follow.send(SIGCONT);
    EXPECT_TRUE(follow.says("too many changes at once: reading the tree again\n"));
    EXPECT_TRUE(follow.says("rotation: 0-cp_wcn-2016-03-01_09-16-00.log follows " +
                            std::to_string(count) + "-cp_wcn"));
    follow.close_pipe();
    EXPECT_EQ(follow.finish(), 0);

    if (system("unshare -Ur true 2>/dev/null") != 0) {
        GTEST_SKIP() << "a limit of watches of our own needs a user namespace";
    }
    m_root.write_file("other/cp_wcn.version", "v");
    Following limited(
        {"unshare", "-Ur", "sh", "-c", "echo 3 >/proc/sys/user/max_inotify_watches; exec \"$@\"",
         "sh", KESTLOG, "follow", m_root.path("other"), m_root.path("modem_log")},
        false);
    EXPECT_TRUE(limited.says("limit of watches is reached .*\n"));
    EXPECT_TRUE(limited.says("following 2 sets, 3 files"));
    m_root.write_file("other/0-cp_wcn-2016-03-01_09-16-00.log", "y");
    EXPECT_TRUE(limited.says("new log: 0-cp_wcn-2016-03-01_09-16-00.log\n"));
}

TEST_F(KestlogFollowTreeTest, ATerminalHasATableAndGetsItsCursorAndEchoBack) {
    m_root.write_file(WCN + "0-cp_wcn-2016-03-01_09-15-00.log", std::string(2048, 'x'));
    Following follow({KESTLOG, "follow", m_root.path("modem_log")}, true);
    EXPECT_TRUE(follow.says("\x1b\\[\\?25l"));
    // Cut to the 60 columns of the window, and drawn again after each line and each second.
    EXPECT_TRUE(follow.says("\ncp_wcn              1       2.0 KB      0 bytes/s  0-cp_wcn\r"));
    m_root.write_file(SET + "cp_gnss/0-cp_gnss-2016-03-01_09-15-00.log", std::string(4096, 'x'));
    EXPECT_TRUE(follow.says("\x1b\\[2A\r\x1b\\[J[0-9:]{8}  [^\n]* cp_gnss  new log: 0-cp_gnss-"));
    EXPECT_TRUE(follow.says("\ncp_gnss             1       4.0 KB [^\n]*B/s  0-cp_gns\r"));
    EXPECT_TRUE(follow.says("\nall                 2       6.0 KB "));
    struct winsize wide = {3, 100, 0, 0};
    ASSERT_EQ(ioctl(follow.fd(), TIOCSWINSZ, &wide), 0);
    EXPECT_TRUE(follow.says("\ncp_gnss [^\n]*  0-cp_gnss-2016-03-01_09-15-00.log\x1b\\[1A"));
    struct termios state;
    ASSERT_EQ(tcgetattr(follow.fd(), &state), 0);
    EXPECT_EQ(state.c_lflag & ECHO, 0u);
    follow.type("\x03");
    EXPECT_TRUE(follow.says("\n\x1b\\[\\?25h"));
    EXPECT_EQ(tcgetattr(follow.fd(), &state), 0);
    EXPECT_EQ(state.c_lflag & ECHO, ECHO);
    EXPECT_EQ(follow.finish(), 0);
}

TEST_F(KestlogFollowTreeTest, WhatCannotBeFollowedEndsAtOnce) {
    m_root.write_file("file", "x");
    m_root.make_dir("modem_log");
    EXPECT_EQ(Following({KESTLOG, "follow", m_root.path("nowhere")}, false).finish(), 2);
    EXPECT_EQ(Following({KESTLOG, "follow", m_root.path("file")}, false).finish(), 2);
    for (const std::string args : {"join ", "export ", "bundle -o - --crash 2016-03-01 "}) {
        Following binary({"sh", "-c", "'" KESTLOG "' " + args + m_root.path("modem_log")}, true);
        EXPECT_TRUE(binary.says("a terminal cannot show this")) << args;
        EXPECT_EQ(binary.finish(), 1);
    }
    EXPECT_EQ(Following({"sh", "-c", "exec \"$@\" >/dev/full", "sh", KESTLOG, "follow",
                         m_root.path("modem_log")},
                        false)
                  .finish(),
              4);
}

}  // namespace
