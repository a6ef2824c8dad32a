// SPDX-License-Identifier: Apache-2.0

#include <cutils/properties.h>
#include <fcntl.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <time.h>

#include "support/TestRoot.h"
#include "support/faults.h"

namespace {

// Newer kernels give finer times to a file that is being watched; the common tick is 10 ms.
int coarsened(int result, struct stat* st) {
    for (struct timespec* t : {&st->st_mtim, &st->st_ctim}) {
        t->tv_nsec -= t->tv_nsec % 10000000;
    }
    return result;
}

std::string get(const char* key, const char* fallback = "DEFAULT") {
    char value[PROPERTY_VALUE_MAX + 8];
    memset(value, '#', sizeof(value));
    const int len = property_get(key, value, fallback);
    EXPECT_EQ(static_cast<size_t>(len), strlen(value));
    EXPECT_EQ(std::string(value + PROPERTY_VALUE_MAX, 8), "########");
    return value;
}

int opens_of_one_read() {
    const int before = faults::calls(faults::OPEN);
    get("k");
    return faults::calls(faults::OPEN) - before;
}

// Replaces bytes of the file, keeping its inode and its size.
void overwrite(const TestRoot& root, off_t at, const std::string& bytes) {
    const int fd = open(root.path("default.prop").c_str(), O_WRONLY | O_CLOEXEC);
    EXPECT_EQ(pwrite(fd, bytes.data(), bytes.size(), at), static_cast<ssize_t>(bytes.size()));
    close(fd);
}

class Properties : public testing::Test {
protected:
    Properties() {
        faults::only_on("default.prop");
        faults::instead.stat = [](const char* path, struct stat* st) {
            return coarsened(real::stat(path, st), st);
        };
        faults::instead.fstat = [](int fd, struct stat* st) {
            return coarsened(real::fstat(fd, st), st);
        };
    }
    ~Properties() override {
        faults::reset();
        faults::instead = {};
    }

    TestRoot m_root;
};

TEST_F(Properties, FileGrammar) {
    using namespace std::string_literals;
    const std::string v91(91, 'x');
    const struct {
        std::string file;
        std::string expected;  // of the property "k"
    } cases[] = {
        {"k=v\r\n", "v"},
        {"k=\n", ""},
        {"k=old\na=1\nk=new\n", "new"},
        {"#\nk=v\n", "v"},
        {"=v\n=k\n", "DEFAULT"},
        {"k=a\0b\n"s, "DEFAULT"},
        {"k =v\nkk=v\nK=v\n k=v\n", "DEFAULT"},
        {"k=" + v91 + "\n", v91},
        {"k=v\nk=" + v91 + "x\n", "DEFAULT"},
        {std::string(300000, 'a') + "=" + std::string(300000, 'b') + "\nk=v\n", "v"},
        {"k\0=a\nk=v\n\0"s, "v"},
        {"#" + std::string((1 << 20) - 5, 'c') + "\nk=v\n", "DEFAULT"},  // a byte too long
        {"#" + std::string((1 << 20) - 6, 'c') + "\nk=v\n", "v"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.file.substr(0, 100));
        m_root.write_file("default.prop", c.file);
        EXPECT_EQ(get("k"), c.expected);
        EXPECT_EQ(get(""), "DEFAULT");
    }
    EXPECT_EQ(get("none", nullptr), "");
    EXPECT_EQ(get("none", std::string(200, 'd').c_str()), std::string(91, 'd'));
}

TEST_F(Properties, OnlyARegularFileIsRead) {
    m_root.make_dir("default.prop");
    EXPECT_EQ(get("k"), "DEFAULT");
    ASSERT_EQ(rmdir(m_root.path("default.prop").c_str()), 0);
    ASSERT_EQ(mkfifo(m_root.path("default.prop").c_str(), 0600), 0);
    EXPECT_EQ(get("k"), "DEFAULT");  // and does not wait for a writer
    ASSERT_EQ(unlink(m_root.path("default.prop").c_str()), 0);
    m_root.write_file("default.prop", "k=v\n");
    ASSERT_EQ(truncate(m_root.path("default.prop").c_str(), off_t(1) << 40), 0);
    const size_t before = open_descriptors();
    EXPECT_EQ(get("k"), "DEFAULT");
    EXPECT_EQ(open_descriptors(), before);
}

TEST_F(Properties, SteadyStateCostsOneStat) {
    m_root.write_file("default.prop", "k=value that is longer than a short string\n");
    ASSERT_TRUE(wait_until([] { return opens_of_one_read() == 0; }));
    char value[PROPERTY_VALUE_MAX];
    const int opens = faults::calls(faults::OPEN);
    const int stats = faults::calls(faults::STAT);
    for (int i = 0; i < 1000; ++i) {
        property_get("k", value, "");
        property_get("a key that is missing and longer than a short string", value, "");
    }
    EXPECT_EQ(faults::calls(faults::OPEN), opens);
    EXPECT_LE(faults::calls(faults::STAT), stats + 2000);
    // A change is still seen, and the state then becomes steady again.
    overwrite(m_root, 2, "VALUE");
    EXPECT_EQ(get("k"), "VALUE that is longer than a short string");
    EXPECT_TRUE(wait_until([] { return opens_of_one_read() == 0; }));
    faults::fail(faults::STAT, 1, ENOMEM);  // which tells nothing
    EXPECT_EQ(get("k"), "VALUE that is longer than a short string");
}

TEST_F(Properties, StampsOfWholeSeconds) {
    struct timespec now = {1000, 500000000};
    const auto stamped = [](int result, struct stat* st) {
        st->st_mtim = st->st_ctim = {1000, 0};
        return result;
    };
    faults::instead.clock_gettime = [&](clockid_t, struct timespec* t) {
        *t = now;
        return 0;
    };
    faults::instead.stat = [&](const char* path, struct stat* st) {
        return stamped(real::stat(path, st), st);
    };
    faults::instead.fstat = [&](int fd, struct stat* st) {
        return stamped(real::fstat(fd, st), st);
    };
    m_root.write_file("default.prop", "k=a\n");
    EXPECT_EQ(get("k"), "a");
    overwrite(m_root, 2, "b");
    EXPECT_EQ(get("k"), "b");
    now.tv_sec += 3;
    EXPECT_EQ(get("k"), "b");
    EXPECT_EQ(opens_of_one_read(), 0);
}

// A file older than the clock's tick is settled at once; a clock set back does not keep
// it from settling. Without a clock nothing tells.
TEST_F(Properties, WallClockJumps) {
    time_t wall_clock_shift = 0;
    faults::instead.clock_gettime = [&](clockid_t clock, struct timespec* t) {
        const int result = real::clock_gettime(clock, t);
        t->tv_sec += clock == CLOCK_MONOTONIC ? 0 : wall_clock_shift;
        return result;
    };
    for (const time_t shift : {3600, -3600}) {
        TestRoot root;
        root.write_file("default.prop", "k=v\n");
        wall_clock_shift = shift;
        EXPECT_EQ(opens_of_one_read(), 1);
        EXPECT_TRUE(shift < 0 || opens_of_one_read() == 0);
        EXPECT_TRUE(wait_until([] { return opens_of_one_read() == 0; }));
        setenv("KESTMODEM_ROOT", m_root.root().c_str(), 1);  // a changed root is seen at once
        EXPECT_EQ(get("k"), "DEFAULT");
    }
    setenv("KESTMODEM_ROOT", m_root.root().c_str(), 1);
    m_root.write_file("default.prop", "k=v\n");
    wall_clock_shift = 0x70000000;
    faults::instead.clock_gettime = [&](clockid_t, struct timespec* t) {
        *t = {wall_clock_shift += 3600, 0};  // whatever was there
        return -1;
    };
    for (int i = 0; i < 3; ++i) {
        EXPECT_EQ(opens_of_one_read(), 1);
    }
}

}  // namespace
