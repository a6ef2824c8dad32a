// SPDX-License-Identifier: Apache-2.0

#include "storage/log_name.h"

#include <ctype.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

// The name ends at the end of its memory, so that a sanitizer sees a read behind it.
LogType parse(const std::string& name, LogTime& time) {
    const std::vector<char> exact(name.begin(), name.end());
    return parse_log_name(exact.data(), exact.size(), time);
}

TEST(LogName, KindAndTime) {
    const struct {
        LogType type;
        std::vector<std::string> names;
    } cases[] = {
        {LT_LOG,
         {"0-cp_wcdma-2016-03-01_09-15-00.log", "99999999999-x2016-03-01_09-15-00",
          "1-9999x2016x03x01x09x15x00", "1-2016-03-0 2016-03-01_09-15-00"}},
        {LT_DUMP, {"memory_2016-03-01_09-15-00.dmp", "a_2016-03-01_09-15-00.dmp.dmp"}},
        {LT_VERSION, {".version", "mini_dump_2016-03-01_09-15-00.version"}},
        {LT_UNKNOWN,
         {"4-x.log", "4-", "4", "4x-2016-03-01_09-15-00.log", "-0-cp-2016-03-01_09-15-00.log",
          "version", "memory_2016-03-01_09-15-00.mem", "cp_1234_2016-03-01_09-15-00.dmp",
          "cp2016-03-01_09-15-00.dmp", "_2016.dmp", ".dmp", "mini_dump_x2016-03-01_09-15-00.bin",
          ""}},
    };
    for (const auto& c : cases) {
        for (const std::string& name : c.names) {
            LogTime time;
            EXPECT_EQ(parse(name, time), c.type) << name;
            const bool timed = c.type == LT_LOG || c.type == LT_DUMP;
            const LogTime expected = timed ? LogTime{2016, 3, 1, 9, 15, 0} : LogTime();
            EXPECT_FALSE(time < expected || expected < time) << name;
        }
    }
}

// Every digit of the timestamp has to be one; every shorter name is not recognised.
TEST(LogName, DamagedTimestamps) {
    const std::string stamp = "2016-03-01_09-15-00";
    const struct {
        std::string prefix;
        LogType type;
    } cases[] = {{"0-cp-", LT_LOG},
                 {"mini_dump_", LT_MINI_DUMP},
                 {"sblock_", LT_IPC_INFO},
                 {"sbuf_", LT_IPC_INFO},
                 {"smsg_", LT_IPC_INFO}};
    for (const auto& c : cases) {
        const std::string name = c.prefix + stamp;
        LogTime time;
        for (size_t i = 0; i < stamp.size(); ++i) {
            std::string damaged = name;
            damaged[c.prefix.size() + i] = ':';
            EXPECT_EQ(parse(damaged, time), isdigit(stamp[i]) ? LT_UNKNOWN : c.type) << damaged;
            EXPECT_EQ(parse(name.substr(0, name.size() - 1 - i), time), LT_UNKNOWN) << i;
        }
    }
}

TEST(LogName, NumbersAndTimeOrder) {
    uint32_t number = 0;
    size_t digits = 0;
    EXPECT_EQ(parse_log_number("007-x", number, digits), 0);
    EXPECT_EQ(number, 7u);
    EXPECT_EQ(digits, 3u);
    EXPECT_EQ(parse_log_number("4294967296-", number, digits), 0);
    EXPECT_EQ(number, 0u) << "larger values wrap until there is another digit";
    for (const char* name : {"12", "-12-", "1x-", "42949672959-"}) {
        EXPECT_EQ(parse_log_number(name, number, digits), -1) << name;
    }
    // Ascending; each differs from the one before in an earlier field than any after it.
    const std::vector<LogTime> times = {{2015, 12, 31, 23, 59, 59}, {2016, 1, 30, 23, 59, 59},
                                        {2016, 2, 1, 22, 0, 0},     {2016, 2, 1, 23, 0, 59},
                                        {2016, 2, 1, 23, 1, 0},     {2016, 2, 1, 23, 1, 1}};
    for (size_t i = 1; i < times.size(); ++i) {
        EXPECT_TRUE(times[i - 1] < times[i] && !(times[i] < times[i - 1])) << i;
    }
}

}  // namespace
