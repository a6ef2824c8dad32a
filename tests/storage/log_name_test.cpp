#include "storage/log_name.h"

#include <gtest/gtest.h>
#include <string.h>

#include <string>
#include <vector>

#include "storage/StorageFixture.h"

namespace {

// The name ends at the end of its memory, so that a sanitizer sees a read behind it.
LogType parse(const std::string& name, LogTime& time) {
    const std::vector<char> exact(name.begin(), name.end());
    return parse_log_name(exact.data(), exact.size(), time);
}

const char STAMP[] = "2016-03-01_09-15-00";

TEST(LogName, KindAndTime) {
    const struct {
        const char* name;
        LogType type;
        bool timed;  // 2016-03-01 09:15:00, else all 0
    } cases[] = {
        {"0-cp_wcdma-2016-03-01_09-15-00.log", LT_LOG, true},
        {"4294967295-x2016-03-01_09-15-00", LT_LOG, true},
        {"007-12345-2016-03-01_09-15-00.log", LT_LOG, true},
        {"1-9999x2016-03-01_09-15-00", LT_LOG, true},
        {"3-2016x03x01x09x15x00", LT_LOG, true},
        {"1-2016-03-0 2016-03-01_09-15-00", LT_LOG, true},
        {"0-cp-2016-03-01_09-15-0", LT_UNKNOWN, false},
        {"0-cp-2016-03-01_09-15-0x", LT_UNKNOWN, false},
        {"4-x.log", LT_UNKNOWN, false},
        {"4-", LT_UNKNOWN, false},
        {"4", LT_UNKNOWN, false},
        {"4x-2016-03-01_09-15-00.log", LT_UNKNOWN, false},
        {"2016.version", LT_UNKNOWN, false},
        {"-0-cp-2016-03-01_09-15-00.log", LT_UNKNOWN, false},
        {"cp_gnss.version", LT_VERSION, false},
        {".version", LT_VERSION, false},
        {"mini_dump_2016-03-01_09-15-00.version", LT_VERSION, false},
        {"version", LT_UNKNOWN, false},
        {"cp_wcdma_memory_2016-03-01_09-15-00.dmp", LT_DUMP, true},
        {"a_2016-03-01_09-15-00.dmp.dmp", LT_DUMP, true},
        {"cp_wcdma_memory_2016-03-01_09-15-00.mem", LT_UNKNOWN, false},
        {"cp_1234_2016-03-01_09-15-00.dmp", LT_UNKNOWN, false},  // only the first one counts
        {"cp2016-03-01_09-15-00.dmp", LT_UNKNOWN, false},
        {"_2016.dmp", LT_UNKNOWN, false},
        {".dmp", LT_UNKNOWN, false},
        {"mini_dump_2016-03-01_09-15-00.bin", LT_MINI_DUMP, true},
        {"mini_dump_x2016-03-01_09-15-00.bin", LT_UNKNOWN, false},
        {"sblock_2016-03-01_09-15-00.log", LT_IPC_INFO, true},
        {"sbuf_2016-03-01_09-15-00", LT_IPC_INFO, true},
        {"smsg_2016-03-01_09-15-00.log", LT_IPC_INFO, true},
        {"smsg_2016.log", LT_UNKNOWN, false},
        {"smsg_", LT_UNKNOWN, false},
        {"Smsg_2016-03-01_09-15-00.log", LT_UNKNOWN, false},
        {"", LT_UNKNOWN, false},
        {"\xff\xfe 2016-03-01_09-15-00", LT_UNKNOWN, false},
    };
    for (const auto& c : cases) {
        LogTime time;
        EXPECT_EQ(c.type, parse(c.name, time)) << c.name;
        const int expected[] = {2016, 3, 1, 9, 15, 0};
        const int fields[] = {time.year, time.month, time.day, time.hour, time.minute, time.second};
        for (size_t i = 0; i < 6; ++i) {
            EXPECT_EQ(c.timed ? expected[i] : 0, fields[i]) << c.name << " field " << i;
        }
    }
}

// Every digit of the timestamp has to be one; every shorter name is not recognised.
TEST(LogName, DamagedTimestamps) {
    for (const char* prefix : {"0-cp-", "mini_dump_", "sblock_", "sbuf_", "smsg_"}) {
        const std::string name = prefix + std::string(STAMP);
        LogTime time;
        for (size_t i = 0; i < strlen(STAMP); ++i) {
            std::string damaged = name;
            damaged[strlen(prefix) + i] = ':';
            const bool separator = strchr("-_", STAMP[i]) != nullptr;
            EXPECT_EQ(separator, parse(damaged, time) != LT_UNKNOWN) << damaged;
            EXPECT_EQ(LT_UNKNOWN, parse(name.substr(0, name.size() - 1 - i), time)) << i;
        }
    }
}

TEST(LogName, Numbers) {
    const struct {
        const char* name;
        int result;
        uint32_t number;
        size_t digits;
    } cases[] = {{"12-cp.log", 0, 12, 2},
                 {"0-", 0, 0, 1},
                 {"007-x", 0, 7, 3},
                 {"12", -1, 0, 0},
                 {"-12-", -1, 0, 0},
                 {"cp_wcn.version", -1, 0, 0},
                 {"", -1, 0, 0},
                 {"1x-", -1, 0, 0},
                 {"4294967295-", 0, UINT32_MAX, 10},
                 {"42949672959-", -1, 0, 0}};
    for (const auto& c : cases) {
        uint32_t number = 0;
        size_t digits = 0;
        EXPECT_EQ(c.result, parse_log_number(c.name, number, digits)) << c.name;
        if (c.result == 0) {
            EXPECT_EQ(c.number, number) << c.name;
            EXPECT_EQ(c.digits, digits) << c.name;
        }
    }
}

TEST(LogName, TimeOrder) {
    // Ascending; each differs from the one before in an earlier field than any after it.
    const LogTime times[] = {{},
                             {2015, 12, 31, 23, 59, 59},
                             {2016, 1, 30, 23, 59, 59},
                             {2016, 2, 1, 22, 0, 0},
                             {2016, 2, 1, 23, 0, 59},
                             {2016, 2, 1, 23, 1, 0},
                             {2016, 2, 1, 23, 1, 1}};
    const size_t num = sizeof(times) / sizeof(times[0]);
    for (size_t i = 0; i < num; ++i) {
        for (size_t j = 0; j < num; ++j) {
            EXPECT_EQ(i < j, times[i] < times[j]) << i << " " << j;
        }
    }
}

}  // namespace
