// SPDX-License-Identifier: Apache-2.0

#include "storage/MediaStorage.h"

#include <algorithm>
#include <filesystem>

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
        rescan();
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

TEST_F(MediaStorageTest, TheTotalsFollowTheMedium) {
    init();
    internal().set_quota(10);
    LogFile* const gone = make("cp");
    gone->write("12345678", 8);
    make("cp", LT_DUMP, "dump")->write("12345678", 8);
    ASSERT_EQ(unlink(m_root.path(ROOT + TODAY + "/cp/" + gone->name().string()).c_str()), 0);
    gone->dir()->file_removed(gone);
    EXPECT_EQ(internal().check_quota(), 0) << "nothing is trimmed for it";
    EXPECT_EQ(m_root.find("dump").size(), 1u);
    internal().set_quota(1);
    faults::fail(faults::UNLINK, 1, EIO);
    EXPECT_EQ(internal().check_quota(), -1);
    EXPECT_EQ(internal().size(), 8u) << "it is still there";
    remove_tree(m_root.path(ROOT + TODAY).c_str());
    make("cp")->write("1", 1);
    EXPECT_EQ(internal().size(), 1u);
    check_sums(internal());
}

TEST_F(MediaStorageTest, WhatIsNotClearedIsSaid) {
    init();
    LogCapture log;
    m_mgr.clear_all();
    EXPECT_EQ(log.count("not all logs"), 0u) << log.text();
    faults::fail(faults::SYSTEM, 1, EAGAIN, faults::FOREVER);
    m_mgr.clear_all();
    EXPECT_EQ(log.count("not all logs in " + m_root.path("data/modem_log")), 1u) << log.text();
}

// The card was changed between two writes: of the new one nothing was counted, nor trimmed.
TEST_F(MediaStorageTest, WhatLiesInAnotherTreeCounts) {
    init();
    make("cp")->write("12345678", 8);
    m_root.write_file(ROOT + "2016-01-01-00-00-00/cp/f", "old card");
    rescan();
    make("cp")->write("1", 1);
    remove_tree(m_root.path(ROOT).c_str());
    m_root.write_file(ROOT + "2016-02-01-00-00-00/cp/f", "123456");
    make("cp")->write("123", 3);
    internal().set_quota(5);
    EXPECT_EQ(internal().check_quota(), 0);
    EXPECT_EQ(internal().size(), 3u);
    EXPECT_TRUE(m_root.find("f").empty());
    check_sums(internal());
}

// Counting looks at every file, and a check is made for every block that is refused.
TEST_F(MediaStorageTest, ARefusedWriteIsCheap) {
    init();
    m_mgr.set_overwrite(false);
    internal().set_quota(10);
    for (int i = 0; i < 1600; ++i) {
        m_root.write_file(ROOT + "2016-02-01-00-00-00/cp/" + std::to_string(i), "x");
    }
    rescan();
    faults::reset();
    for (int i = 0; i < 151; ++i) {
        EXPECT_EQ(internal().check_quota(), -1);
    }
    EXPECT_GE(faults::calls(faults::LSTAT), 1600);
    EXPECT_LE(faults::calls(faults::LSTAT), 6500);  // four times
}

// Somebody made a directory of the tree a link, to one that has the same names: nothing is made
// or deleted there, neither by what is known of the medium nor after a new scan.
TEST_F(MediaStorageTest, NoLinkLeadsOutOfTheTree) {
    for (const bool kest : {false, true}) {
        m_mgr.set_kest_layout(kest);
        init();
        const std::string top = kest ? "data/kest" : "data/modem_log";
        const std::string log_root = kest ? top + "/modem_log" : top;
        const std::string old_set = log_root + "/2016-02-01-00-00-00";
        const std::string set = log_root + "/" + TODAY;
        Names places = {old_set, old_set + "/cp", set, set + "/cp"};
        if (kest) {
            places.insert(places.end(), {top, log_root});
        }
        for (const std::string& linked : places) {
            SCOPED_TRACE(linked);
            internal().clear();
            ::remove_tree(m_root.path(top).c_str());
            m_root.write_file(old_set + "/cp/f", "12345678");
            m_root.make_dir(log_root + "/2016-02-02-00-00-00");
            ASSERT_EQ(internal().stat(), 0);
            make("cp");
            make("cp", LT_DUMP, "dump")->write("123", 3);
            const std::string path = m_root.path(linked), away = m_root.path("away");
            ASSERT_EQ(rename(path.c_str(), away.c_str()) + symlink(away.c_str(), path.c_str()), 0);
            const auto names = [&] {
                Names all;
                for (const auto& entry : std::filesystem::recursive_directory_iterator(away)) {
                    all.push_back(entry.path());
                }
                std::sort(all.begin(), all.end());
                return all;
            };
            const Names before = names();
            for (const bool scanned : {false, true}) {
                if (CpDirectory* dir = internal().get_cp_dir("cp")) {
                    dir->rotate_logs();
                    EXPECT_EQ(dir->remove_file(*--dir->files().end()), 0);
                }
                internal().trim(1000);
                make("cp", LT_DUMP, "another");
                internal().create_cp_set();
                EXPECT_EQ(names(), before) << scanned;
                EXPECT_EQ(internal().can_make_files(), linked != top && linked != log_root);
                internal().clear();
                EXPECT_EQ(internal().stat(), linked != top && linked != log_root ? 0 : -1);
                EXPECT_EQ(names(), before) << scanned;
            }
            internal().clear_all();
            EXPECT_EQ(names(), before) << "after a clear";
            unlink(path.c_str());
            ::remove_tree(away.c_str());
        }
    }
}

// Where only the administrator makes links, the log root may be one.
TEST_F(MediaStorageTest, LogsGoWhereTheAdministratorWantsThem) {
    m_root.make_dir("large/2016-02-01-00-00-00/cp");
    m_root.make_dir("data");
    ASSERT_EQ(symlink("../large", m_root.path("data/modem_log").c_str()), 0);
    init();
    ASSERT_TRUE(make("cp"));
    EXPECT_EQ(internal().sets().size(), 2u);
    EXPECT_TRUE(internal().can_make_files());
    internal().clear_all();
    EXPECT_EQ(m_root.list("large"), Names());
}

}  // namespace
