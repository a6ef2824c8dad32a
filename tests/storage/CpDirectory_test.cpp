#include "storage/CpDirectory.h"

#include <errno.h>

#include <algorithm>

#include "storage/StorageFixture.h"

namespace {

const std::string SET = "data/modem_log/2016-03-01-09-15-00/";
const std::string DIR_REL = SET + "cp_wcn/";
const std::string V = "cp_wcn.version";

std::string log_name(int number, const char* time = "10-00-00") {
    return std::to_string(number) + "-cp_wcn-2016-03-01_" + time + ".log";
}

class CpDirectoryTest : public StorageTest {
protected:
    // A set object with the directory, which is scanned when it exists.
    CpDirectory& dir() {
        if (!m_dir) {
            init();
            m_set = internal().create_cp_set();
            bool new_dir = false;
            m_dir = m_set->prepare_cp_dir("cp_wcn", new_dir);
        }
        return *m_dir;
    }
    // Appends a listed file of that size.
    LogFile* add(const std::string& name, LogType type, uint32_t size) {
        LogFile* file = dir().create_file(name.c_str(), type);
        file->close();
        file->set_size(size);
        return file;
    }

    CpSetDirectory* m_set = nullptr;
    CpDirectory* m_dir = nullptr;
};

TEST_F(CpDirectoryTest, ScanOrder) {
    const Names expected = {log_name(2, "10-00-00"), log_name(1, "11-00-00"),
                            log_name(0, "12-00-00"), V};
    Names names = expected;
    names.push_back("junk.txt");
    std::sort(names.begin(), names.end());
    do {
        SCOPED_TRACE(names[0] + names[1]);
        TestRoot root;  // the entries in another order of creation, so of readdir perhaps
        for (const std::string& name : names) {
            root.write_file(DIR_REL + name, std::string(10, 'x'));
        }
        StorageManager mgr;
        ASSERT_EQ(0, mgr.init("", nullptr, nullptr));
        const CpDirectory* dir =
            (*mgr.get_media(MT_INTERNAL)->sets().begin())->get_cp_dir("cp_wcn");
        ASSERT_NE(nullptr, dir);
        Names all = expected;
        all.insert(all.begin(), "junk.txt");
        EXPECT_EQ(all, file_names(*dir));
        EXPECT_EQ(50u, dir->size());
    } while (std::next_permutation(names.begin(), names.end()));
}

// Kinds that share a second: the logs by falling number, whatever stands between them.
TEST_F(CpDirectoryTest, ScanOrderWithinOneSecond) {
    for (int i = 0; i < 40; ++i) {
        m_root.write_file(DIR_REL + log_name((i * 7) % 40), "x");
        m_root.write_file(DIR_REL + "mini_dump_2016-03-01_10-00-00." + std::to_string(i), "x");
        m_root.write_file(DIR_REL + "u" + std::to_string(i), "x");
    }
    m_root.write_file(DIR_REL + "smsg_2016-03-01_09-59-59.log", "x");
    m_root.write_file(DIR_REL + "a_2016-03-01_10-00-01.dmp", "x");
    // Unknown files lead, each ahead of the ones found before.
    Names unknown;
    for (DIR* d = opendir(m_root.path(DIR_REL).c_str()); d;) {
        const struct dirent* entry = readdir(d);
        if (!entry) {
            closedir(d);
            break;
        }
        if (entry->d_name[0] == 'u') {
            unknown.insert(unknown.begin(), entry->d_name);
        }
    }
    init();
    const Names names = file_names(*(*internal().sets().begin())->get_cp_dir("cp_wcn"));
    ASSERT_EQ(122u, names.size());
    EXPECT_EQ(unknown, Names(names.begin(), names.begin() + 40));
    EXPECT_EQ("smsg_2016-03-01_09-59-59.log", names[40]);
    EXPECT_EQ("a_2016-03-01_10-00-01.dmp", names.back());
    int next = 39;
    for (const std::string& name : names) {
        if (name.find("-cp_wcn-") != std::string::npos) {
            EXPECT_EQ(log_name(next--), name);
        }
    }
    EXPECT_EQ(-1, next);
}

TEST_F(CpDirectoryTest, ScanSkipsWhatIsNoFile) {
    m_root.write_file(DIR_REL + "file", "12345");
    m_root.write_file(DIR_REL + "sub/file", "123");
    m_root.write_file("outside", "1234567");
    ASSERT_EQ(0, mkfifo(m_root.path(DIR_REL + "fifo").c_str(), 0600));
    ASSERT_EQ(0, symlink(m_root.path("outside").c_str(), m_root.path(DIR_REL + "link").c_str()));
    ASSERT_EQ(0, symlink("nowhere", m_root.path(DIR_REL + "dangling").c_str()));
    put(DIR_REL + "huge", (1ll << 32) + 1000);
    init();
    CpDirectory* dir = (*internal().sets().begin())->get_cp_dir("cp_wcn");
    Names names = file_names(*dir);
    std::sort(names.begin(), names.end());
    EXPECT_EQ((Names{"file", "huge"}), names);
    EXPECT_EQ((1ull << 32) + 1005, internal().size());
    m_root.write_file("plain", "");
    CpSetDirectory none(&internal(), m_root.path("plain").c_str());
    EXPECT_EQ(-1, none.stat());
    EXPECT_EQ(-1, CpDirectory(&none, "x").stat());
    EXPECT_EQ(-1, CpDirectory(&none, "x").create());
    EXPECT_EQ(0, none.create());  // something of that name exists
}

TEST_F(CpDirectoryTest, CreateLogFile) {
    ObjectRef<LogFile> first(dir().create_log_file());
    ASSERT_TRUE(first);
    EXPECT_STREQ("0-cp_wcn-2016-03-01_09-15-00.log", first->name().string());
    EXPECT_EQ(LT_LOG, first->type());
    EXPECT_EQ(2016, first->time().year);
    EXPECT_EQ(0775u, mode_of(m_root.path(DIR_REL)));
    EXPECT_EQ(0775u, mode_of(m_root.path(SET)));
    // Without rotation a second file of the same second is the same file of the medium.
    dir().rotate_logs();
    faults::set_time(NOW + 1);
    LogFile* second = dir().create_log_file();
    EXPECT_EQ((Names{"1-cp_wcn-2016-03-01_09-15-00.log", "0-cp_wcn-2016-03-01_09-15-01.log"}),
              file_names(dir()));
    // Failures leave everything as it is.
    faults::fail(faults::OPEN, 1, ENOSPC, 2);
    EXPECT_EQ(nullptr, dir().create_log_file());
    EXPECT_EQ(nullptr, dir().create_file("x", LT_DUMP));
    faults::set_time(-1);
    EXPECT_EQ(nullptr, dir().create_log_file());
    EXPECT_EQ(2u, dir().files().size());
    second->write("x", 1);
    dir().close_log_file();
    dir().close_log_file();
    EXPECT_EQ(-1, second->fd());
    EXPECT_GE(first->fd(), 0);
    check_sums(internal());
}

TEST_F(CpDirectoryTest, RotationGoesOnAfterAFailure) {
    add(log_name(2, "10-00-00"), LT_LOG, 1);
    add("mini_dump_x", LT_MINI_DUMP, 1);
    add(log_name(1, "11-00-00"), LT_LOG, 1);
    add("odd.log", LT_LOG, 1);
    add(log_name(0, "12-00-00"), LT_LOG, 1);
    faults::fail(faults::RENAME, 1, EIO);
    dir().rotate_logs();
    EXPECT_EQ((Names{log_name(2, "10-00-00"), "mini_dump_x", log_name(2, "11-00-00"), "odd.log",
                     log_name(1, "12-00-00")}),
              file_names(dir()));
}

// Log files of one second: a failed renaming made the next younger file, or a new one,
// take the name and with it the place of an older file on the medium.
TEST_F(CpDirectoryTest, FilesOfOneSecondAreNeverReplaced) {
    faults::set_time(NOW);
    dir().create_log_file()->write("first", 5);
    dir().rotate_logs();
    dir().create_log_file()->write("second", 6);
    faults::fail(faults::RENAME, 1, EIO);
    dir().rotate_logs();
    EXPECT_EQ((Names{"1-cp_wcn-2016-03-01_09-15-00.log", "0-cp_wcn-2016-03-01_09-15-00.log"}),
              file_names(dir()));
    EXPECT_EQ(nullptr, dir().create_log_file());
    EXPECT_EQ(2u, m_root.list(DIR_REL).size());
    // Once it can be renumbered the log goes on.
    dir().rotate_logs();
    EXPECT_NE(nullptr, dir().create_log_file());
    EXPECT_EQ(3u, m_root.list(DIR_REL).size());
}

TEST_F(CpDirectoryTest, Trim) {
    const struct {
        uint64_t wanted;
        int failing;  // number of the unlink that fails
        uint64_t removed;
        size_t left;
    } cases[] = {{0, 0, 10, 3},     {1, 0, 10, 3},   {10, 0, 10, 3},
                 {11, 0, 30, 2},    {30, 0, 30, 2},  {31, 0, 60, 1},
                 {1000, 0, 100, 0}, {1000, 1, 0, 4}, {1000, 3, 30, 2}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.wanted);
        LogCapture log;
        std::vector<ObjectRef<LogFile>> refs;
        for (uint32_t i = 1; i <= 4; ++i) {
            refs.emplace_back(add("f" + std::to_string(i), LT_DUMP, 10 * i));
        }
        faults::fail(faults::UNLINK, c.failing > 0 ? c.failing : 1000, EIO);
        EXPECT_EQ(c.removed, dir().trim(c.wanted));
        EXPECT_EQ(c.left, dir().files().size());
        EXPECT_EQ(c.left, m_root.list(DIR_REL).size());
        EXPECT_EQ(100 - c.removed, dir().size());
        EXPECT_EQ(100u, internal().size());  // left to the callers
        for (size_t i = 0; i < 4; ++i) {
            EXPECT_EQ(i >= 4 - c.left, static_cast<bool>(refs[i]));
        }
        EXPECT_EQ(c.failing > 0, log.has("uint64_t CpDirectory::trim(uint64_t): delete f" +
                                         std::to_string(c.failing) + " error ["));
        faults::reset();
        faults::set_time(NOW);
        dir().trim(1000);
        m_set->dec_size(100);
    }
}

TEST_F(CpDirectoryTest, TrimWorkingDir) {
    LogFile* first = dir().create_log_file();
    first->set_size(10);
    for (int n = 9; n >= 6; --n) {
        faults::set_time(NOW + 10 - n);
        dir().rotate_logs();
        dir().create_log_file()->set_size(10);
    }
    for (int i = 0; i < 6; ++i) {
        dir().rotate_logs();  // 10 (first), 9, 8, 7, 6
    }
    add(V, LT_VERSION, 10);
    add("iq.bin", LT_WCDMA_IQ, 10);
    ObjectRef<LogFile> dump(add("ring", LT_RINGBUF, 10));
    faults::set_time(NOW + 20);
    LogFile* current = dir().create_log_file();
    current->set_size(10);
    auto numbers = [&] {
        std::string all;
        for (const std::string& name : file_names(dir())) {
            all += name.substr(0, name.find_first_of("-.")) + " ";
        }
        return all;
    };
    ASSERT_EQ("10 9 8 7 6 cp_wcn iq ring 0 ", numbers());
    EXPECT_EQ(20u, dir().trim_working_dir(20));
    EXPECT_EQ("8 7 6 cp_wcn iq ring 0 ", numbers());
    EXPECT_TRUE(m_root.exists(DIR_REL + "8-cp_wcn-2016-03-01_09-15-00.log"));
    // A request for nothing still takes one; a failure stops the walk, the files stay.
    EXPECT_EQ(10u, dir().trim_working_dir(0));
    EXPECT_EQ("7 6 cp_wcn iq ring 0 ", numbers());
    LogCapture log;
    faults::fail(faults::UNLINK, 2, EIO);
    EXPECT_EQ(10u, dir().trim_working_dir(1000));
    EXPECT_TRUE(log.has("uint64_t CpDirectory::trim_working_dir(uint64_t): delete ring error ["));
    EXPECT_EQ("1 cp_wcn iq ring 0 ", numbers());
    EXPECT_EQ(10u, dir().trim_working_dir(1000));
    EXPECT_FALSE(dump);
    // Only protected files are left: nothing goes, nothing is renamed.
    const int renames = faults::calls(faults::RENAME);
    EXPECT_EQ(0u, dir().trim_working_dir(1000));
    EXPECT_EQ(renames, faults::calls(faults::RENAME));
    EXPECT_EQ("1 cp_wcn iq 0 ", numbers());
    EXPECT_EQ(40u, dir().size());
    EXPECT_EQ(first->name(), "1-cp_wcn-2016-03-01_09-15-00.log");
    // A closed current log is protected no more; a vanished first one leaves no mark.
    dir().close_log_file();
    EXPECT_EQ(10u, dir().trim_working_dir(5));
    dir().file_removed(first);
    EXPECT_EQ(0u, dir().trim_working_dir(1000));
    EXPECT_EQ("cp_wcn iq ", numbers());
}

TEST_F(CpDirectoryTest, ScannedLogsKeepTheFirstMarkAway) {
    m_root.write_file(DIR_REL + log_name(3), "x");
    init();
    CpDirectory* dir = (*internal().sets().begin())->get_cp_dir("cp_wcn");
    ObjectRef<LogFile> made(dir->create_log_file());
    dir->close_log_file();
    EXPECT_EQ(1u, dir->trim_working_dir(1000));
    EXPECT_FALSE(made);
    EXPECT_TRUE(dir->empty());
}

TEST_F(CpDirectoryTest, RemovedAndVanishedFiles) {
    LogFile* log_file = dir().create_log_file();
    log_file->write("0123456789", 10);
    LogFile* dump = dir().create_file("d.dmp", LT_DUMP);
    dump->write("01234", 5);
    const size_t before = open_descriptors();
    ObjectRef<LogFile> log_ref(log_file), dump_ref(dump);
    EXPECT_EQ(0, dir().remove_file(dump));
    EXPECT_FALSE(dump_ref);
    EXPECT_FALSE(m_root.exists(DIR_REL + "d.dmp"));
    EXPECT_EQ(10u, dir().size());
    check_sums(internal());
    dir().file_removed(log_file);
    EXPECT_FALSE(log_ref);
    EXPECT_EQ(0u, dir().size());
    check_sums(internal(), 10);
    EXPECT_EQ(before - 2, open_descriptors());
    dir().close_log_file();
    // An object of another directory.
    CpDirectory other(m_set, "other");
    LogFile stranger("s", &other, LT_DUMP, 3);
    LogCapture log;
    EXPECT_EQ(-1, dir().remove_file(&stranger));
    EXPECT_EQ("", log.text());
    dir().file_removed(&stranger);
    EXPECT_TRUE(
        log.has("void CpDirectory::file_removed(LogFile*): log s does not exist in dir "
                "cp_wcn ["));
    // The unlink fails: gone all the same.
    dump = add("e.dmp", LT_DUMP, 7);
    faults::fail(faults::UNLINK, 1, EIO);
    EXPECT_EQ(0, dir().remove_file(dump));
    EXPECT_TRUE(dir().empty());
    check_sums(internal(), 10);
}

TEST_F(CpDirectoryTest, ScanOfManyFilesIsNotQuadratic) {
    const int num = 20000;
    m_root.make_dir(DIR_REL);
    for (int i = 0; i < num; ++i) {
        const int at = (i * 7919) % num;
        char name[64];
        snprintf(name, sizeof(name), "%d-cp_wcn-2016-03-01_%02d-%02d-%02d.log", num - 1 - at,
                 at / 3600, at / 60 % 60, at % 60);
        close(open(m_root.path(DIR_REL + name).c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0644));
    }
    const double walk = seconds([] {}, [&] { plain_walk(m_root.path("data/modem_log")); });
    const double scan = seconds([&] { internal().clear(); }, [&] { init(); });
    EXPECT_LT(scan, SCAN_FACTOR * walk);
    const Names names = file_names(*(*internal().sets().begin())->get_cp_dir("cp_wcn"));
    ASSERT_EQ(static_cast<size_t>(num), names.size());
    for (int i = 0; i < num; ++i) {
        ASSERT_EQ(num - 1 - i, atoi(names[static_cast<size_t>(i)].c_str()));
    }
}

}  // namespace
