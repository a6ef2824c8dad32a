// SPDX-License-Identifier: Apache-2.0

#include "storage/CpSetDirectory.h"

#include <errno.h>

#include <algorithm>

#include "storage/StorageFixture.h"
#include "storage/paths.h"

namespace {

const std::string REL = "data/modem_log/2016-03-01-09-15-00/";

Names dir_names(const CpSetDirectory& set) {
    Names names;
    for (const CpDirectory* dir : set.dirs()) {
        names.push_back(dir->name().string());
    }
    std::sort(names.begin(), names.end());
    return names;
}

class CpSetDirectoryTest : public StorageTest {};

TEST_F(CpSetDirectoryTest, ScanTakesWhatBelongsThere) {
    m_root.write_file(REL + "file", "12345");
    m_root.write_file(REL + "cp_wcn/a", "123");
    m_root.write_file(REL + "cp_gnss/b", "1234");
    m_root.write_file(REL + "cp_wcn/sub/file", "123");
    m_root.write_file("outside/secret", "1234567");
    ASSERT_EQ(mkfifo(m_root.path(REL + "cp_wcn/fifo").c_str(), 0600), 0);
    for (const char* link : {"link", "cp_wcn/link"}) {
        ASSERT_EQ(symlink(m_root.path("outside").c_str(), m_root.path(REL + link).c_str()), 0);
    }
    ASSERT_EQ(symlink("nowhere", m_root.path(REL + "cp_wcn/dangling").c_str()), 0);
    ASSERT_EQ(
        symlink(m_root.path("outside/secret").c_str(), m_root.path(REL + "cp_wcn/to_file").c_str()),
        0);
    ASSERT_NO_FATAL_FAILURE(start());
    EXPECT_EQ(dir_names(*m_set), (Names{"cp_gnss", "cp_wcn"}));
    EXPECT_EQ(file_names(*m_dir), Names{"a"});
    EXPECT_EQ(m_set->size(), 7u);
    check_sums(internal());
    // All go but the set's own directory, and nothing behind a link.
    EXPECT_EQ(m_set->trim(1000), 7u);
    EXPECT_TRUE(m_set->empty());
    EXPECT_EQ(internal().size(), 7u);  // left to the caller
    EXPECT_EQ(m_root.list(REL), (Names{"file", "link"}));
    m_set->remove();
    EXPECT_FALSE(m_root.exists(REL));
    EXPECT_TRUE(m_root.exists("outside/secret"));
}

// A file found with more than 4 GiB left 4 GiB in the totals for ever when it was trimmed.
TEST_F(CpSetDirectoryTest, TrimGoesDirectoryByDirectory) {
    constexpr uint64_t SIZE = 5ull << 30;
    for (const char* cp : {"a", "b", "c", "d"}) {
        put(REL + cp + "/1", SIZE);
        put(REL + cp + "/2", SIZE);
    }
    init();
    CpSetDirectory* set = *internal().sets().begin();
    EXPECT_EQ(set->size(), 8 * SIZE);
    EXPECT_EQ(set->trim(2 * SIZE), 2 * SIZE);  // exactly one directory's
    EXPECT_EQ(set->trim(3 * SIZE), 3 * SIZE);
    // A file that cannot be deleted keeps its directory; the walk goes on with the next.
    const std::string stuck = (*set->dirs().begin())->name().string();
    faults::fail(faults::UNLINK, 1, EIO);
    EXPECT_EQ(set->trim(2 * SIZE), 2 * SIZE);
    EXPECT_EQ(m_root.list(REL), Names{stuck});
    EXPECT_EQ(set->size(), SIZE);
    EXPECT_EQ(set->trim(0), SIZE);
    EXPECT_TRUE(set->empty());
}

TEST_F(CpSetDirectoryTest, DirectoriesOnDemand) {
    init();
    CpSetDirectory* set = internal().create_cp_set();
    bool new_dir = false;
    ObjectRef<LogFile> log_file(set->create_log_file("cp_wcn", new_dir));
    ASSERT_TRUE(log_file);
    EXPECT_TRUE(new_dir);
    log_file->write("12345", 5);
    set->get_cp_dir("cp_wcn")->rotate_logs();
    EXPECT_TRUE(set->create_log_file("cp_wcn", new_dir) && !new_dir);
    // Somebody deletes it: made anew, its files' references gone, the medium keeps the sum.
    const size_t before = open_descriptors();
    remove_tree(m_root.path(REL + "cp_wcn").c_str());
    EXPECT_NE(set->prepare_cp_dir("cp_wcn", new_dir), nullptr);
    EXPECT_TRUE(new_dir);
    EXPECT_FALSE(log_file);
    EXPECT_EQ(open_descriptors(), before - 2);
    check_sums(internal(), 0, 5);
    // Only a created log file reports a new directory.
    new_dir = false;
    faults::fail(faults::OPEN, 1, ENOSPC);
    EXPECT_EQ(set->create_log_file("cp_gnss", new_dir), nullptr);
    EXPECT_FALSE(new_dir);
    // Something else has the CP's name: no file, and no heap of objects either.
    m_root.write_file(REL + "cp_y", "");
    EXPECT_EQ(set->create_log_file("cp_y", new_dir), nullptr);
    EXPECT_EQ(set->create_log_file("cp_y", new_dir), nullptr);
    EXPECT_EQ(dir_names(*set), (Names{"cp_gnss", "cp_wcn", "cp_y"}));
    // A directory with a first or current log stays when the set in use is trimmed.
    set->create_log_file("cp_wcn", new_dir)->set_size(10);
    set->create_file("cp_gnss", "dump", LT_DUMP)->set_size(10);
    EXPECT_EQ(set->trim_working_dir(1000), 10u);
    EXPECT_EQ(dir_names(*set), Names{"cp_wcn"});
}

}  // namespace
