// SPDX-License-Identifier: Apache-2.0

#include "storage/MediaStorage.h"

#include <errno.h>

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

TEST_F(MediaStorageTest, ScanOrder) {
    for (const char* set :
         {"2016-03-02-08-00-00", "2016-03-01-09-15-00", "2016-03-01-09-15", "zoo", "\xff"}) {
        m_root.write_file(ROOT + set + "/cp/f", "12");
    }
    m_root.write_file(ROOT + "modem_db.gz", "12345");
    ASSERT_EQ(symlink("zoo", m_root.path(ROOT + "link").c_str()), 0);
    init();
    const Names names = {"2016-03-01-09-15", TODAY, "2016-03-02-08-00-00", "zoo", "\xff"};
    EXPECT_EQ(set_names(internal()), names);
    EXPECT_EQ(internal().size(), 10u);
    EXPECT_EQ(internal().get_cp_dir("cp"), nullptr);
    // What is written today joins the set of the same second that was found.
    make("cp")->write("12345", 5);
    EXPECT_EQ(set_names(internal()), names);
    EXPECT_EQ(internal().working_set()->size(), 7u);
    check_sums(internal());
    // A set started before the medium was scanned is not found a second time.
    bool new_dir = false;
    ObjectRef<LogFile> file(external().create_file("cp", LT_DUMP, new_dir, "dump"));
    file->write("12345", 5);
    m_root.write_file("sd/modem_log/2016-04-01-00-00-00/cp/f", "12");
    ASSERT_EQ(external().stat(), 0);
    EXPECT_TRUE(file);
    EXPECT_EQ(set_names(external()), (Names{TODAY, "2016-04-01-00-00-00"}));
    check_sums(external());
}

TEST_F(MediaStorageTest, OneObjectForOneSecond) {
    init();
    CpSetDirectory* const set = internal().create_cp_set();
    ObjectRef<LogFile> first(make("cp"));
    // Gone from the medium within the second: the same object, its directory made again.
    remove_tree(m_root.path(ROOT + TODAY).c_str());
    EXPECT_EQ(internal().create_cp_set(), set);
    EXPECT_TRUE(m_root.exists(ROOT + TODAY));
    EXPECT_NE(make("cp"), nullptr);
    EXPECT_FALSE(first);
    // A failure keeps the working set.
    LogCapture log;
    faults::set_time(NOW + 1);
    faults::fail(faults::MKDIR, 1, ENOSPC);
    EXPECT_EQ(internal().create_cp_set(), nullptr);
    EXPECT_TRUE(log.has("CpSetDirectory* MediaStorage::create_cp_set(): create CP set " +
                        m_root.path(ROOT) + "2016-03-01-09-15-01 failed [28("));
    faults::set_time(-1);
    EXPECT_EQ(internal().create_cp_set(), nullptr);
    EXPECT_EQ(internal().working_set(), set);
}

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

// Each of 30,000 empty sets took a shell, and the loop stood still for a minute.
TEST_F(MediaStorageTest, EmptySetsAreRemovedWithoutAShell) {
    for (int i = 10; i < 50; ++i) {
        m_root.make_dir(ROOT + "2016-02-01-00-00-" + std::to_string(i));
    }
    m_root.write_file(ROOT + "2016-02-02-00-00-00/other", "not the service's");
    init();
    EXPECT_EQ(internal().trim(1), 0u);
    EXPECT_EQ(m_root.list(ROOT), Names{});
    EXPECT_EQ(faults::commands().size(), 1u);
}

}  // namespace
