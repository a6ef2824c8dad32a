#include "config/KestConfig.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <string>

#include "support/TestRoot.h"

namespace {

TEST(KestConfigTest, ReadsStreamsAndTheGlobalSwitch) {
    static const struct {
        const char* text;
        const char* entries;  // type and "+" or "-" each
        size_t invalid;       // lines reported
    } CASES[] = {
        {"enable\nstream cp_wcdma on 1 1\nstream cp_gnss off 1 1\n", "0+6-", 0},
        {"stream cp_wcdma on 1 1\nstream cp_wcn on 1 1\n", "0-5-", 0},
        {"stream cp_tdd-lte on 1 1\nenable now please\n", "2+", 0},  // the switch may come last
        {"enable\nstream cp_fdd-lte on 1 1\nstream cp_td-lte ON 1 1\n", "3+4-", 0},
        {"enable\nstream cp_3mode on 1 1\nstream agdsp on 1 1\nstream nobody\n", "", 0},
        {"enable\nstream cp_wcn on 1 1\nstream cp_wcn off 1 1\n", "5+5-", 0},
        {"enabled\nstream cp_wcn on 1 1\n", "5-", 0},
        {"enable\nvar x\nloglevel 5\n\n  stream\tcp_td-scdma\ton\t0x1\t2 more\r\n", "1+", 0},
        {"enable\nstream\nstream cp_wcn\nstream cp_wcn on\nstream cp_wcn on 1\n", "", 4},
        {"enable\nstream cp_wcn on 1x 1\nstream cp_wcn on 1 99999999999999999999\n", "", 2},
        {"enable\nstream cp_wcn on 1 1", "5+", 0},
    };
    TestRoot root;
    LogCapture log;
    // Missing, nothing to read to an end, and read with an error.
    ASSERT_EQ(mkfifo(root.path("fifo").c_str(), 0600), 0);
    ASSERT_EQ(symlink("/proc/self/mem", root.path("eio").c_str()), 0);
    for (const std::string file : {"none [2(", "fifo [22(", "data [21(", "eio [5("}) {
        const std::string path = root.path(file.substr(0, file.find(' ')));
        EXPECT_EQ(KestConfig().read_config(path.c_str()), -1);
        EXPECT_TRUE(
            log.has("int KestConfig::read_config(const char*): can not open " + root.path(file)));
    }
    for (const auto& c : CASES) {
        SCOPED_TRACE(c.text);
        root.write_file("kest.conf", c.text);
        log.clear();
        KestConfig config;
        EXPECT_EQ(config.read_config(root.path("kest.conf").c_str()), 0);
        std::string entries;
        for (const KestConfig::StreamEntry* entry : config.stream_entries()) {
            entries += std::to_string(entry->type) + (entry->enable ? "+" : "-");
        }
        EXPECT_EQ(entries, c.entries);
        EXPECT_EQ(log.count("Invalid line: "), c.invalid) << log.text();
        EXPECT_EQ(log.text().empty(), c.invalid == 0) << log.text();
    }
}

}  // namespace
