// SPDX-License-Identifier: Apache-2.0

#include <android/log.h>
#include <errno.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <string>

#include "core/log.h"

namespace {

// Standard error as a socket that keeps the boundaries of writes.
class Log : public testing::Test {
protected:
    Log() : m_saved(dup(STDERR_FILENO)), m_head("E/KESTCP(" + std::to_string(getpid()) + "): ") {
        int fds[2] = {-1, -1};
        EXPECT_EQ(socketpair(AF_UNIX, SOCK_SEQPACKET, 0, fds), 0);
        dup2(fds[0], STDERR_FILENO);
        close(fds[0]);
        m_peer = fds[1];
    }
    ~Log() override {
        dup2(m_saved, STDERR_FILENO);
        close(m_saved);
        close(m_peer);
    }

    // What one write gave; "" when nothing was written.
    std::string next() {
        char buf[65536];
        const ssize_t n = recv(m_peer, buf, sizeof(buf), MSG_DONTWAIT);
        return std::string(buf, n > 0 ? static_cast<size_t>(n) : 0);
    }

    int m_saved;
    int m_peer;
    std::string m_head;
};

TEST_F(Log, OneWriteAndOneLineFeedAMessage) {
    const struct {
        const char* text;
        const char* line;
    } cases[] = {
        {"plain", "plain\n"},
        {"many\n\n\n", "many\n"},
        {"\n\n", "\n"},
        {"100% %s %n", "100% %s %n\n"},
    };
    for (const auto& c : cases) {
        const int result = __android_log_print(ANDROID_LOG_ERROR, "KESTCP", "%s", c.text);
        const std::string line = next();
        EXPECT_EQ(line, m_head + c.line);
        EXPECT_EQ(static_cast<size_t>(result), line.size());
        EXPECT_EQ(next(), "");
    }
    __android_log_print(ANDROID_LOG_WARN, "other", "%d", 5);
    EXPECT_EQ(next(), "W/other(" + std::to_string(getpid()) + "): 5\n");
}

// A name on a card may hold anything; a file gets it as it is.
TEST_F(Log, NoControlCharacterReachesATerminal) {
    const char* const text = "a\x1b[2J\tb\x7f\nc \xc3\xa9";
    __android_log_print(ANDROID_LOG_ERROR, "KESTCP", "%s", text);
    EXPECT_EQ(next(), m_head + text + "\n");
    const int master = posix_openpt(O_RDWR | O_NOCTTY);
    ASSERT_EQ(grantpt(master) + unlockpt(master), 0);
    const int slave = open(ptsname(master), O_RDWR | O_NOCTTY);
    dup2(slave, STDERR_FILENO);
    close(slave);
    __android_log_print(ANDROID_LOG_ERROR, "KESTCP", "%s", text);
    std::string line = m_head + "a?[2J\tb?\r\nc \xc3\xa9\r\n";
    std::string got(line.size(), '\0');
    got.resize(static_cast<size_t>(std::max<ssize_t>(read(master, got.data(), got.size()), 0)));
    EXPECT_EQ(got, line);
    close(master);
}

TEST_F(Log, LongTextIsCutButStillALine) {
    for (size_t len = 8100; len < 8300; ++len) {
        const std::string text(len, 'x');
        __android_log_print(ANDROID_LOG_ERROR, "KESTCP", "%s\n", text.c_str());
        const std::string whole = m_head + text + "\n";
        const std::string line = next();
        if (line != whole) {  // cut: as long as the buffer, and only its text is shorter
            ASSERT_GT(whole.size(), 8192u);
            ASSERT_EQ(line.size(), 8192u);
            ASSERT_EQ(line, whole.substr(0, 8191) + "\n");
        }
    }
    __android_log_print(ANDROID_LOG_ERROR, std::string(10000, 't').c_str(), "%s", "x");
    EXPECT_EQ(next().back(), '\n');
}

TEST_F(Log, ErrnoIsReportedAndKept) {
    errno = ENOENT;
    err_log("open %s failed", "/x");
    EXPECT_EQ(errno, ENOENT);
    EXPECT_EQ(next(),
              m_head + __PRETTY_FUNCTION__ + ": open /x failed [2(No such file or directory)]\n");
    close(STDERR_FILENO);
    errno = EPIPE;
    EXPECT_EQ(__android_log_print(ANDROID_LOG_ERROR, "KESTCP", "lost"), -EBADF);
    EXPECT_EQ(errno, EPIPE);
}

}  // namespace
