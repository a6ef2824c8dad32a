#include "storage/log_name.h"

#include <ctype.h>
#include <gtest/gtest.h>

#include <string>
#include <utility>
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
          "007-12345-2016-03-01_09-15-00.log", "1-9999x2016-03-01_09-15-00",
          "3-2016x03x01x09x15x00", "1-2016-03-0 2016-03-01_09-15-00"}},
        {LT_DUMP, {"memory_2016-03-01_09-15-00.dmp", "a_2016-03-01_09-15-00.dmp.dmp"}},
        {LT_VERSION, {"cp_gnss.version", ".version", "mini_dump_2016-03-01_09-15-00.version"}},
        {LT_UNKNOWN,
         {"4-x.log", "4-", "4", "4x-2016-03-01_09-15-00.log", "-0-cp-2016-03-01_09-15-00.log",
          "version", "2016.version", "memory_2016-03-01_09-15-00.mem",
          "cp_1234_2016-03-01_09-15-00.dmp", "cp2016-03-01_09-15-00.dmp", "_2016.dmp", ".dmp",
          "mini_dump_x2016-03-01_09-15-00.bin", "Smsg_2016-03-01_09-15-00.log", "",
          "\xff\xfe 2016-03-01_09-15-00"}},
    };
    for (const auto& c : cases) {
        for (const std::string& name : c.names) {
            LogTime time;
            EXPECT_EQ(c.type, parse(name, time)) << name;
            const bool timed = c.type == LT_LOG || c.type == LT_DUMP;
            const LogTime expected = timed ? LogTime{2016, 3, 1, 9, 15, 0} : LogTime();
            EXPECT_FALSE(time < expected || expected < time) << name;
        }
    }
}

// Every digit of the timestamp has to be one; every shorter name is not recognised.
TEST(LogName, DamagedTimestamps) {
    const std::string stamp = "2016-03-01_09-15-00";
    const std::pair<std::string, LogType> prefixes[] = {{"0-cp-", LT_LOG},
                                                        {"mini_dump_", LT_MINI_DUMP},
                                                        {"sblock_", LT_IPC_INFO},
                                                        {"sbuf_", LT_IPC_INFO},
                                                        {"smsg_", LT_IPC_INFO}};
    for (const auto& p : prefixes) {
        const std::string name = p.first + stamp;
        LogTime time;
        for (size_t i = 0; i < stamp.size(); ++i) {
            std::string damaged = name;
            damaged[p.first.size() + i] = ':';
            EXPECT_EQ(isdigit(stamp[i]) ? LT_UNKNOWN : p.second, parse(damaged, time)) << damaged;
            EXPECT_EQ(LT_UNKNOWN, parse(name.substr(0, name.size() - 1 - i), time)) << i;
        }
    }
}

TEST(LogName, NumbersAndTimeOrder) {
    const std::pair<const char*, uint32_t> cases[] = {
        {"12-cp.log", 12}, {"0-", 0}, {"007-x", 7}, {"4294967295-", UINT32_MAX}};
    uint32_t number = 0;
    size_t digits = 0;
    for (const auto& c : cases) {
        EXPECT_EQ(0, parse_log_number(c.first, number, digits)) << c.first;
        EXPECT_TRUE(c.second == number && c.first[digits] == '-') << c.first;
    }
    for (const char* name : {"12", "-12-", "", "1x-", "42949672959-"}) {
        EXPECT_EQ(-1, parse_log_number(name, number, digits)) << name;
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
