// SPDX-License-Identifier: Apache-2.0

#include "storage/MediaStorage.h"

#include "storage/StorageFixture.h"
#include "storage/paths.h"

namespace {

const std::string ROOT = "data/modem_log/";
const std::string TODAY = "2016-03-01-09-15-00";
const std::string DATA_LARGE = "int MediaStorage::check_quota(): data large: ";

class MediaStorageTest : public StorageTest {
protected:
    LogFile* make(const char* cp, LogType type = LT_LOG, const char* name = "") {
        bool new_dir = false;
        return internal().create_file(cp, type, new_dir, name);
    }
};

// What somebody else deleted stayed in the totals: fresh files were trimmed for it, and in
// the end every write was refused.
TEST_F(MediaStorageTest, WhatVanishedLeavesTheTotals) {
    init();
    internal().set_quota(10);
    for (int i = 0; i < 4; ++i) {
        make("cp")->write("12345678", 8);
        remove_tree(m_root.path(ROOT + TODAY + "/cp").c_str());
    }
    make("cp", LT_DUMP, "dump")->write("123", 3);
    EXPECT_EQ(internal().size(), 35u);  // for now
    LogCapture log;
    EXPECT_EQ(internal().check_quota(), 0);
    EXPECT_EQ(internal().size(), 3u);
    EXPECT_FALSE(log.has(DATA_LARGE));
    check_sums(internal());
    // Unnoticed so far, and nothing may be trimmed.
    m_mgr.set_overwrite(false);
    const std::string set = m_root.path(ROOT + "2016-02-01-00-00-00");
    for (const std::string& command : {"rm -r " + set, "rm -r " + set + "/cp",
                                       "rm " + set + "/cp/f", "truncate -s 1 " + set + "/cp/f"}) {
        SCOPED_TRACE(command);
        m_root.write_file(ROOT + "2016-02-01-00-00-00/cp/f", "12345678");
        internal().clear();
        ASSERT_EQ(internal().stat(), 0);
        EXPECT_EQ(internal().check_quota(), -1);
        ASSERT_EQ(system(command.c_str()), 0);
        int checks = 0;
        while (internal().check_quota() != 0 && checks < 100) {
            ++checks;
        }
        EXPECT_LT(checks, 20);
        check_sums(internal());
    }
}

}  // namespace
