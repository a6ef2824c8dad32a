#include "storage/MediaStorage.h"

#include <errno.h>

#include "storage/StorageFixture.h"
#include "storage/paths.h"

namespace {

const std::string ROOT = "data/modem_log/";
const std::string TODAY = "2016-03-01-09-15-00";
constexpr off_t MIB = 1 << 20;

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
    ASSERT_EQ(0, symlink("zoo", m_root.path(ROOT + "link").c_str()));
    init();
    const Names names = {"2016-03-01-09-15", TODAY, "2016-03-02-08-00-00", "zoo", "\xff"};
    EXPECT_EQ(names, set_names(internal()));
    EXPECT_EQ(10u, internal().size());
    EXPECT_EQ(nullptr, internal().get_cp_dir("cp"));
    // What is written today joins the set of the same second that was found.
    make("cp")->write("12345", 5);
    EXPECT_EQ(names, set_names(internal()));
    EXPECT_EQ(7u, internal().working_set()->size());
    check_sums(internal());
    // A set started before the medium was scanned is not found a second time.
    bool new_dir = false;
    ObjectRef<LogFile> file(external().create_file("cp", LT_DUMP, new_dir, "dump"));
    file->write("12345", 5);
    m_root.write_file("sd/modem_log/2016-04-01-00-00-00/cp/f", "12");
    ASSERT_EQ(0, external().stat());
    EXPECT_TRUE(file);
    EXPECT_EQ((Names{TODAY, "2016-04-01-00-00-00"}), set_names(external()));
    check_sums(external());
}

TEST_F(MediaStorageTest, OneObjectForOneSecond) {
    init();
    CpSetDirectory* set = internal().create_cp_set();
    ObjectRef<LogFile> first(make("cp"));
    EXPECT_EQ(0775u, mode_of(m_root.path("data/modem_log")));
    EXPECT_EQ(0775u, mode_of(m_root.path(ROOT + TODAY)));
    EXPECT_EQ(set, internal().create_cp_set());
    EXPECT_TRUE(first);
    EXPECT_EQ(1u, internal().sets().size());
    // Gone from the medium within the second: the same object, its directory made again.
    remove_tree(m_root.path(ROOT + TODAY).c_str());
    EXPECT_EQ(set, internal().create_cp_set());
    EXPECT_TRUE(m_root.exists(ROOT + TODAY));
    EXPECT_NE(nullptr, make("cp"));
    EXPECT_FALSE(first);
    faults::set_time(NOW + 1);
    EXPECT_NE(set, internal().create_cp_set());
    EXPECT_EQ((Names{TODAY, "2016-03-01-09-15-01"}), set_names(internal()));
    // Failures keep the working set.
    LogCapture log;
    set = internal().working_set();
    faults::fail(faults::MKDIR, 1, ENOSPC, 2);
    EXPECT_EQ(nullptr, internal().create_cp_set());
    faults::set_time(NOW + 2);
    EXPECT_EQ(nullptr, internal().create_cp_set());
    EXPECT_EQ(2u, log.count("CpSetDirectory* MediaStorage::create_cp_set(): create CP set " +
                            m_root.path(ROOT) + "2016-03-01-09-15-0"));
    EXPECT_EQ(2u, log.count(" failed [28("));
    faults::set_time(-1);
    EXPECT_EQ(nullptr, internal().create_cp_set());
    EXPECT_EQ(set, internal().working_set());
    EXPECT_EQ(2u, internal().sets().size());
}

TEST_F(MediaStorageTest, Quota) {
    const struct {
        off_t quota;  // in MiB
        bool overwrite;
        int result;
        off_t left;
    } cases[] = {{0, true, 0, 30},  {30, true, 0, 30}, {25, false, -1, 30},
                 {25, true, 0, 25}, {24, true, 0, 20}, {1, true, 0, 0}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.quota);
        for (int i = 0; i < 6; ++i) {
            const std::string set = ROOT + "2016-02-0" + std::to_string(i / 2 + 1) + "-00-00-00";
            put(set + "/cp/f" + std::to_string(i), 5 * MIB);
        }
        internal().clear();
        init();
        internal().set_quota(static_cast<uint64_t>(c.quota * MIB));
        m_mgr.set_overwrite(c.overwrite);
        LogCapture log;
        EXPECT_EQ(c.result, internal().check_quota());
        EXPECT_EQ(static_cast<uint64_t>(c.left * MIB), internal().size());
        EXPECT_EQ(static_cast<size_t>((c.left + 9) / 10), internal().sets().size());
        EXPECT_EQ(internal().sets().size(), m_root.list(ROOT).size());
        EXPECT_EQ(c.left < 30, log.has("int MediaStorage::check_quota(): data large: 31457280/" +
                                       std::to_string(c.quota) + "M\n"));
        check_sums(internal());
    }
}

// A file found with more than 4 GiB left 4 GiB in the totals for ever when it was trimmed.
TEST_F(MediaStorageTest, FilesOverFourGibibytes) {
    put(ROOT + "2016-02-01-00-00-00/cp/1", 5ll << 30);
    put(ROOT + "2016-02-02-00-00-00/cp/2", MIB);
    init();
    EXPECT_EQ((5ull << 30) + MIB, internal().size());
    internal().set_quota(2 * MIB);
    EXPECT_EQ(0, internal().check_quota());
    EXPECT_EQ(Names{"2016-02-02-00-00-00"}, set_names(internal()));
    EXPECT_EQ(static_cast<uint64_t>(MIB), internal().size());
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
    EXPECT_EQ(35u, internal().size());  // for now
    LogCapture log;
    EXPECT_EQ(0, internal().check_quota());
    EXPECT_EQ(3u, internal().size());
    EXPECT_FALSE(log.has("data large"));
    check_sums(internal());
    // Unnoticed so far, and nothing may be trimmed: a set, a directory, a file, a part of one.
    m_mgr.set_overwrite(false);
    for (const char* gone : {"2016-02-01-00-00-00", "2016-02-02-00-00-00/cp",
                             "2016-02-03-00-00-00/cp/f", "2016-02-04-00-00-00/cp/f"}) {
        SCOPED_TRACE(gone);
        const std::string set = std::string(gone).substr(0, TODAY.size());
        m_root.write_file(ROOT + set + "/cp/f", "12345678");
        internal().clear();
        ASSERT_EQ(0, internal().stat());
        EXPECT_EQ(-1, internal().check_quota());
        if (set == "2016-02-04-00-00-00") {
            ASSERT_EQ(0, truncate(m_root.path(ROOT + gone).c_str(), 1));
        } else {
            ASSERT_EQ(0, system(("rm -fr " + m_root.path(ROOT + gone)).c_str()));
        }
        int checks = 0;
        while (internal().check_quota() != 0 && checks < 100) {
            ++checks;
        }
        EXPECT_LT(checks, 20);
        check_sums(internal());
        remove_tree(m_root.path(ROOT + set).c_str());
    }
}

// Each of 30,000 empty sets took a shell, and the loop stood still for a minute.
TEST_F(MediaStorageTest, EmptySetsAreRemovedWithoutAShell) {
    for (int i = 10; i < 50; ++i) {
        m_root.make_dir(ROOT + "2016-02-01-00-00-" + std::to_string(i));
    }
    m_root.write_file(ROOT + "2016-02-02-00-00-00/other", "not the service's");
    init();
    EXPECT_EQ(0u, internal().trim(1));
    EXPECT_EQ(Names{}, m_root.list(ROOT));
    EXPECT_EQ(1u, faults::commands().size());
}

TEST_F(MediaStorageTest, FreeSpaceWantsHalfAFileSize) {
    const struct {
        off_t old_size;
        bool overwrite;
        int result;
        size_t sets_left;
    } cases[] = {{5 * MIB / 2, true, 0, 0},
                 {5 * MIB / 2 - 1, true, -1, 0},
                 {50 * MIB, true, 0, 0},
                 {50 * MIB, false, -1, 1}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.old_size);
        put(ROOT + "2016-02-01-00-00-00/cp/f", c.old_size);
        internal().clear();
        init();
        m_mgr.set_file_size(5 * MIB);
        m_mgr.set_overwrite(c.overwrite);
        EXPECT_EQ(c.result, internal().free_space());
        EXPECT_EQ(c.sets_left, m_root.list(ROOT).size());
        check_sums(internal());
    }
}

}  // namespace
