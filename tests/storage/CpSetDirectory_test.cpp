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
    ASSERT_EQ(0, mkfifo(m_root.path(REL + "cp_wcn/fifo").c_str(), 0600));
    for (const char* link : {"link", "cp_wcn/link"}) {
        ASSERT_EQ(0, symlink(m_root.path("outside").c_str(), m_root.path(REL + link).c_str()));
    }
    ASSERT_EQ(0, symlink("nowhere", m_root.path(REL + "cp_wcn/dangling").c_str()));
    ASSERT_EQ(0, symlink(m_root.path("outside/secret").c_str(),
                         m_root.path(REL + "cp_wcn/to_file").c_str()));
    start();
    EXPECT_EQ((Names{"cp_gnss", "cp_wcn"}), dir_names(*m_set));
    EXPECT_EQ(Names{"a"}, file_names(*m_dir));
    EXPECT_EQ(7u, m_set->size());
    check_sums(internal());
    // All go but the set's own directory, and nothing behind a link.
    EXPECT_EQ(7u, m_set->trim(1000));
    EXPECT_TRUE(m_set->empty());
    EXPECT_EQ(7u, internal().size());  // left to the caller
    EXPECT_EQ((Names{"file", "link"}), m_root.list(REL));
    m_set->remove();
    EXPECT_FALSE(m_root.exists(REL));
    EXPECT_TRUE(m_root.exists("outside/secret"));
}

TEST_F(CpSetDirectoryTest, TrimGoesDirectoryByDirectory) {
    for (const char* cp : {"a", "b", "c", "d"}) {
        put(REL + cp + "/1", 10);
        put(REL + cp + "/2", 10);
    }
    init();
    CpSetDirectory* set = *internal().sets().begin();
    EXPECT_EQ(20u, set->trim(20));  // exactly one directory's
    EXPECT_EQ(30u, set->trim(25));
    EXPECT_EQ(2u, m_root.list(REL).size());
    // A file that cannot be deleted keeps its directory; the walk goes on with the next.
    faults::fail(faults::UNLINK, 1, EIO);
    EXPECT_EQ(20u, set->trim(20));
    EXPECT_EQ(10u, set->size());
    EXPECT_EQ(10u, set->trim(0));
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
    EXPECT_NE(nullptr, set->prepare_cp_dir("cp_wcn", new_dir));
    EXPECT_TRUE(new_dir);
    EXPECT_FALSE(log_file);
    EXPECT_EQ(before - 2, open_descriptors());
    check_sums(internal(), 0, 5);
    // Only a created log file reports a new directory.
    new_dir = false;
    faults::fail(faults::OPEN, 1, ENOSPC);
    EXPECT_EQ(nullptr, set->create_log_file("cp_gnss", new_dir));
    EXPECT_FALSE(new_dir);
    // Something else has the CP's name: no file, and no heap of objects either.
    m_root.write_file(REL + "cp_y", "");
    EXPECT_EQ(nullptr, set->create_log_file("cp_y", new_dir));
    EXPECT_EQ(nullptr, set->create_log_file("cp_y", new_dir));
    EXPECT_EQ((Names{"cp_gnss", "cp_wcn", "cp_y"}), dir_names(*set));
    // A directory with a first or current log stays when the set in use is trimmed.
    set->create_log_file("cp_wcn", new_dir)->set_size(10);
    set->create_file("cp_gnss", "dump", LT_DUMP)->set_size(10);
    EXPECT_EQ(10u, set->trim_working_dir(1000));
    EXPECT_EQ(Names{"cp_wcn"}, dir_names(*set));
}

}  // namespace
