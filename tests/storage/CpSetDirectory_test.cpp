#include "storage/CpSetDirectory.h"

#include <errno.h>

#include <algorithm>

#include "storage/StorageFixture.h"
#include "storage/paths.h"

namespace {

const std::string OLD = "data/modem_log/2016-02-01-00-00-00/";
const std::string NEW = "data/modem_log/2016-03-01-09-15-00/";

class CpSetDirectoryTest : public StorageTest {
protected:
    static Names dir_names(const CpSetDirectory& set) {
        Names names;
        for (const CpDirectory* dir : set.dirs()) {
            names.push_back(dir->name().string());
        }
        std::sort(names.begin(), names.end());
        return names;
    }
};

TEST_F(CpSetDirectoryTest, ScanTakesDirectoriesOnly) {
    m_root.write_file(OLD + "file", "12345");
    m_root.write_file(OLD + "cp_wcn/a", "123");
    m_root.write_file(OLD + "cp_gnss/b", "1234");
    m_root.write_file("outside/secret", "1234567");
    ASSERT_EQ(0, symlink(m_root.path("outside").c_str(), m_root.path(OLD + "link").c_str()));
    init();
    CpSetDirectory* set = *internal().sets().begin();
    EXPECT_EQ((Names{"cp_gnss", "cp_wcn"}), dir_names(*set));
    EXPECT_EQ(7u, set->size());
    check_sums(internal());
    EXPECT_EQ(nullptr, set->get_cp_dir("cp"));
    EXPECT_EQ(nullptr, set->get_cp_dir("link"));
    // More than everything: all go but the set's own directory, and nothing behind the link.
    EXPECT_EQ(7u, set->trim(1000));
    EXPECT_TRUE(set->empty());
    EXPECT_EQ(0u, set->size());
    EXPECT_EQ(7u, internal().size());
    EXPECT_EQ((Names{"file", "link"}), m_root.list(OLD));
    set->remove();
    EXPECT_FALSE(m_root.exists(OLD));
    EXPECT_TRUE(m_root.exists("outside/secret"));
}

TEST_F(CpSetDirectoryTest, TrimGoesDirectoryByDirectory) {
    for (const char* cp : {"a", "b", "c", "d"}) {
        put(OLD + cp + "/1", 10);
        put(OLD + cp + "/2", 10);
    }
    init();
    CpSetDirectory* set = *internal().sets().begin();
    EXPECT_EQ(20u, set->trim(20));  // exactly one directory's
    EXPECT_EQ(3u, set->dirs().size());
    EXPECT_EQ(30u, set->trim(25));
    EXPECT_EQ(2u, set->dirs().size());
    EXPECT_EQ(2u, m_root.list(OLD).size());
    // A file that cannot be deleted keeps its directory; the walk goes on with the next.
    faults::fail(faults::UNLINK, 1, EIO);
    EXPECT_EQ(20u, set->trim(20));
    EXPECT_EQ(1u, set->dirs().size());
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
    new_dir = true;
    set->get_cp_dir("cp_wcn")->rotate_logs();
    EXPECT_NE(nullptr, set->create_log_file("cp_wcn", new_dir));
    EXPECT_FALSE(new_dir);
    new_dir = false;
    CpDirectory* dir = set->prepare_cp_dir("cp_wcn", new_dir);
    EXPECT_EQ(set->get_cp_dir("cp_wcn"), dir);
    EXPECT_FALSE(new_dir);
    // Somebody deletes it: made anew, its files' references gone, the medium keeps the sum.
    const size_t before = open_descriptors();
    remove_tree(m_root.path(NEW + "cp_wcn").c_str());
    dir = set->prepare_cp_dir("cp_wcn", new_dir);
    EXPECT_TRUE(new_dir);
    EXPECT_FALSE(log_file);
    EXPECT_EQ(before - 2, open_descriptors());
    EXPECT_TRUE(m_root.exists(NEW + "cp_wcn"));
    EXPECT_EQ(1u, set->dirs().size());
    check_sums(internal(), 0, 5);
    // Only a created log file reports a new directory.
    new_dir = false;
    faults::fail(faults::OPEN, 1, ENOSPC);
    EXPECT_EQ(nullptr, set->create_log_file("cp_gnss", new_dir));
    EXPECT_FALSE(new_dir);
    EXPECT_NE(nullptr, set->create_file("cp_wcn", "dump", LT_DUMP));
    faults::fail(faults::MKDIR, 1, ENOSPC);
    EXPECT_EQ(nullptr, set->create_file("cp_x", "dump", LT_DUMP));
    EXPECT_EQ((Names{"cp_gnss", "cp_wcn"}), dir_names(*set));
    // Something else has the CP's name: no file, and no heap of objects either.
    m_root.write_file(NEW + "cp_y", "");
    for (int i = 0; i < 3; ++i) {
        EXPECT_EQ(nullptr, set->create_log_file("cp_y", new_dir));
        EXPECT_EQ((Names{"cp_gnss", "cp_wcn", "cp_y"}), dir_names(*set));
    }
    check_sums(internal(), 0, 5);
}

// In the set being written a directory with a first or current log never goes.
TEST_F(CpSetDirectoryTest, TrimWorkingDir) {
    init();
    CpSetDirectory* set = internal().create_cp_set();
    bool new_dir = false;
    set->create_log_file("cp_wcn", new_dir)->set_size(10);
    set->create_file("cp_wcn", "dump", LT_DUMP)->set_size(10);
    set->create_file("cp_gnss", "dump", LT_DUMP)->set_size(10);
    EXPECT_EQ(20u, set->trim_working_dir(1000));
    EXPECT_EQ(Names{"cp_wcn"}, dir_names(*set));
    EXPECT_EQ(Names{"cp_wcn"}, m_root.list(NEW));
    EXPECT_EQ(10u, set->size());
}

// Sets and CP directories with names that a shell could misread are removed as they are.
TEST_F(CpSetDirectoryTest, StrangeNames) {
    m_root.write_file("canary", "");
    const int cwd = open(".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    ASSERT_EQ(0, chdir(m_root.root().c_str()));
    uint64_t total = 0;
    for (const std::string& name : strange_names()) {
        m_root.write_file("data/modem_log/" + name + "/" + name + "/" + name, "123");
        total += 3;
    }
    init();
    EXPECT_EQ(strange_names().size(), internal().sets().size());
    EXPECT_EQ(total, internal().size());
    EXPECT_EQ(total, internal().trim(total));
    EXPECT_EQ(2 * strange_names().size(), faults::commands().size());
    EXPECT_EQ(Names{}, m_root.list("data/modem_log"));
    EXPECT_EQ(0u, internal().sets().size());
    EXPECT_EQ((Names{"canary", "data", "sd"}), m_root.list(""));
    EXPECT_EQ(0, fchdir(cwd));
    close(cwd);
}

}  // namespace
