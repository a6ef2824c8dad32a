// SPDX-License-Identifier: Apache-2.0

#include "config/KestConfig.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <string>

#include "support/TestRoot.h"

namespace {

TEST(KestConfigTest, ReadsStreamsAndTheGlobalSwitch) {
    static const struct {
        const char* text;
        const char* streams;
        size_t invalid;  // lines reported
    } CASES[] = {
        {"enable\nstream cp_wcn on 1 1\nstream cp_gnss off 1 1\n", "cp_wcn on, cp_gnss off, ", 0},
        {"enabled\nstream cp_wcn on 1 1\n", "cp_wcn off, ", 0},
        {"stream cp_tdd-lte on 1 1\nenable now please\n", "cp_3mode on, ", 0},
        {"enable\nstream cp_3mode on 1 1\nstream agdsp on 1 1\nstream nobody\n", "", 0},
        {"enable\nstream cp_wcn on 1 1\nstream cp_wcn off 1 1", "cp_wcn on, cp_wcn off, ", 0},
        {"enable\nvar x\n\n  stream\tcp_td-scdma\ton\t0x1\t2 more\r\n", "cp_td-scdma on, ", 0},
        {"enable\nstream\nstream cp_wcn on\nstream cp_wcn on 1x 1\n", "", 3},
        {"enable\nstream cp_wcn on 99999999999999999999 1\nstream cp_gnss on 1 1\n", "cp_gnss on, ",
         1},
    };
    TestRoot root;
    LogCapture log;
    ASSERT_EQ(symlink("/proc/self/mem", root.path("eio").c_str()), 0);
    for (const char* file : {"missing", "eio"}) {
        EXPECT_EQ(KestConfig().read_config(root.path(file).c_str()), -1);
        EXPECT_TRUE(
            log.has("int KestConfig::read_config(const char*): can not open " + root.path(file)));
    }
    for (const auto& c : CASES) {
        SCOPED_TRACE(c.text);
        root.write_file("kest.conf", c.text);
        log.clear();
        KestConfig config;
        EXPECT_EQ(config.read_config(root.path("kest.conf").c_str()), 0);
        std::string streams;
        for (const KestConfig::StreamEntry* entry : config.stream_entries()) {
            streams +=
                std::string(cp_type_to_name(entry->type)) + (entry->enable ? " on, " : " off, ");
        }
        EXPECT_EQ(streams, c.streams);
        EXPECT_EQ(log.count("Invalid line: "), c.invalid) << log.text();
        EXPECT_EQ(log.text().empty(), c.invalid == 0) << log.text();
    }
}

}  // namespace
