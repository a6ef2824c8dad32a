#include "storage/CpDirectory.h"

#include <dirent.h>
#include <errno.h>

#include <algorithm>

#include "storage/StorageFixture.h"

static size_t g_comparisons = 0;  // of the times of files

// LogTime::operator<, by its name in the object files.
extern "C" bool __real__ZNK7LogTimeltERKS_(const LogTime* a, const LogTime* b);
extern "C" bool __wrap__ZNK7LogTimeltERKS_(const LogTime* a, const LogTime* b);
extern "C" bool __wrap__ZNK7LogTimeltERKS_(const LogTime* a, const LogTime* b) {
    ++g_comparisons;
    return __real__ZNK7LogTimeltERKS_(a, b);
}

namespace {

const std::string SET = "data/modem_log/2016-03-01-09-15-00/";
const std::string DIR_REL = SET + "cp_wcn/";

std::string log_name(int number, const char* time = "10-00-00") {
    return std::to_string(number) + "-cp_wcn-2016-03-01_" + time + ".log";
}

class CpDirectoryTest : public StorageTest {
protected:
    // Appends a listed file of that size.
    LogFile* add(const std::string& name, LogType type, uint32_t size) {
        LogFile* file = m_dir->create_file(name.c_str(), type);
        file->close();
        file->set_size(size);
        return file;
    }
    // The start of each file's name: a log's number, another's first word.
    std::string numbers() const {
        std::string all;
        for (const std::string& name : file_names(*m_dir)) {
            all += name.substr(0, name.find_first_of("-.")) + " ";
        }
        return all;
    }
};

// Kinds that share a second: the logs by falling number, whatever stands between them.
TEST_F(CpDirectoryTest, ScanOrder) {
    const std::string early = "smsg_2016-03-01_09-59-59.log", late = "a_2016-03-01_10-00-01.dmp";
    for (int i = 0; i < 40; ++i) {
        m_root.write_file(DIR_REL + log_name((i * 7) % 40), "x");
        m_root.write_file(DIR_REL + "mini_dump_2016-03-01_10-00-00." + std::to_string(i), "x");
        m_root.write_file(DIR_REL + "u" + std::to_string(i), "x");
    }
    for (const std::string& name : {early, late, log_name(41, "11-00-00")}) {
        m_root.write_file(DIR_REL + name, "x");
    }
    put(DIR_REL + "a.version", (1ll << 32) + 1);
    // Unknown files lead, each ahead of the ones found before.
    Names unknown;
    DIR* const d = opendir(m_root.path(DIR_REL).c_str());
    while (const struct dirent* entry = d ? readdir(d) : nullptr) {
        if (entry->d_name[0] == 'u') {
            unknown.insert(unknown.begin(), entry->d_name);
        }
    }
    closedir(d);
    start();
    const Names names = file_names(*m_dir);
    ASSERT_EQ(124u, names.size());
    EXPECT_EQ((1ull << 32) + 124, m_dir->size());
    EXPECT_EQ(unknown, Names(names.begin(), names.begin() + 40));
    EXPECT_EQ(early, names[40]);
    EXPECT_EQ((Names{late, log_name(41, "11-00-00"), "a.version"}),
              Names(names.end() - 3, names.end()));
    int next = 39;
    for (size_t i = 41; i < 121; ++i) {
        if (names[i].find("-cp_wcn-") != std::string::npos) {
            EXPECT_EQ(log_name(next--), names[i]);
        }
    }
    EXPECT_EQ(-1, next);
}

// A walk along the list for every file would compare two million times.
TEST_F(CpDirectoryTest, ScanIsNotQuadratic) {
    constexpr size_t num = 3000;
    m_root.write_file("file", "");
    m_root.make_dir(DIR_REL);
    Names expected(num);
    for (size_t i = 0; i < num; ++i) {
        const size_t at = (i * 7919) % num;
        char time[16];
        snprintf(time, sizeof(time), "10-%02zu-%02zu", at / 60, at % 60);
        expected[at] = log_name(static_cast<int>(num - 1 - at), time);
        ASSERT_EQ(0,
                  link(m_root.path("file").c_str(), m_root.path(DIR_REL + expected[at]).c_str()));
    }
    g_comparisons = 0;
    start();
    EXPECT_GT(g_comparisons, num);
    EXPECT_LT(g_comparisons, 100 * num);
    EXPECT_EQ(expected, file_names(*m_dir));
}

// A file of the same second and name was written over when renaming it had failed, or when
// no list knew it.
TEST_F(CpDirectoryTest, NoFileIsEverWrittenOver) {
    start();
    const std::string name = log_name(0, "09-15-00"), aside = "0-cp_wcn-2016-03-01_09-15-00-1.log";
    // Not listed: set aside, and it counts from now on.
    m_root.write_file(DIR_REL + name, "stranger");
    LogFile* first = m_dir->create_log_file();
    first->write("first", 5);
    EXPECT_EQ((Names{aside, name}), file_names(*m_dir));
    EXPECT_EQ("stranger", m_root.read_file(DIR_REL + aside));
    EXPECT_EQ(13u, m_dir->size());
    // Listed: likewise.
    EXPECT_NE(nullptr, m_dir->create_log_file());
    first->close();
    EXPECT_EQ("first", m_root.read_file(DIR_REL + "0-cp_wcn-2016-03-01_09-15-00-2.log"));
    // Listed, but gone: dropped. What cannot be moved keeps its name; the new file has another.
    ObjectRef<LogFile> gone(add("a.dmp", LT_DUMP, 7));
    unlink(m_root.path(DIR_REL + "a.dmp").c_str());
    LogFile* stuck = m_dir->create_file("a.dmp", LT_DUMP);
    EXPECT_FALSE(gone);
    stuck->write("stuck", 5);
    faults::fail(faults::RENAME, 1, EIO);
    EXPECT_STREQ("a-3.dmp", m_dir->create_file("a.dmp", LT_DUMP)->name().string());
    EXPECT_STREQ("a.dmp", stuck->name().string());
    m_dir->create_file("a.dmp", LT_DUMP);
    stuck->close();
    EXPECT_EQ("stuck", m_root.read_file(DIR_REL + "a-4.dmp"));
    EXPECT_EQ(18u, m_dir->size());
    check_sums(internal());
    faults::set_time(-1);
    EXPECT_EQ(nullptr, m_dir->create_log_file());
}

// Numbers ran away while no log file could be made, and two files kept one number for ever
// when a renaming had failed once.
TEST_F(CpDirectoryTest, NumbersStayInOrder) {
    auto number = [&](int second) {
        faults::set_time(NOW + second);
        m_dir->rotate_logs();
    };
    start();
    for (int second : {0, 1, 2}) {
        number(second);
        m_dir->create_log_file()->set_size(10);
    }
    ASSERT_EQ("2 1 0 ", numbers());
    for (int tries = 0; tries < 3; ++tries) {
        number(3);
        EXPECT_EQ("3 2 1 ", numbers());  // once: then the number 0 is free
    }
    m_dir->create_log_file();
    faults::fail(faults::RENAME, 3, EIO);  // that of number 1
    number(4);
    m_dir->create_log_file();
    ASSERT_EQ("4 3 1 1 0 ", numbers());
    number(5);
    EXPECT_EQ("5 4 3 2 1 ", numbers());
    m_dir->create_log_file();
    // Deleted by somebody else: dropped, the others go on.
    unlink(m_root.path(DIR_REL + log_name(4, "09-15-01")).c_str());
    const uint64_t size = m_dir->size();
    number(6);
    EXPECT_EQ("6 4 3 2 1 ", numbers());
    EXPECT_EQ(size - 10, m_dir->size());
    check_sums(internal());
    // A stranger has the name that a file is to take: the next number, and above it likewise.
    m_dir->create_log_file();
    m_root.write_file(DIR_REL + log_name(3, "09-15-04"), "stranger");
    number(7);
    EXPECT_EQ("7 6 5 4 2 1 ", numbers());
    EXPECT_EQ("stranger", m_root.read_file(DIR_REL + log_name(3, "09-15-04")));
}

// Bytes that a file cannot write out as it goes have left the totals with the file already.
TEST_F(CpDirectoryTest, FilesThatGoAreCountedOnce) {
    put(DIR_REL + "a", 5ll << 30);
    start();
    m_dir->remove_file(*m_dir->files().begin());
    check_sums(internal());
    faults::fail(faults::WRITE, 1, ENOSPC, 1000);
    for (int way = 0; way < 3; ++way) {
        m_dir->create_file("open.dmp", LT_DUMP)->write("12345", 5);
        if (way == 0) {
            EXPECT_EQ(5u, m_set->trim(1));
            internal().dec_size(5);  // as MediaStorage::trim does
        } else if (way == 1) {
            m_dir->remove_file(*m_dir->files().begin());
        } else {
            m_set->remove();
            bool new_dir = false;
            m_set->create();
            m_set->prepare_cp_dir("cp_wcn", new_dir);
            EXPECT_EQ(0u, m_set->size());
            EXPECT_EQ(5u, internal().size());  // uncertain for now
            break;
        }
        check_sums(internal());
        bool new_dir = false;
        m_dir = m_set->prepare_cp_dir("cp_wcn", new_dir);
    }
}

TEST_F(CpDirectoryTest, TrimTakesWholeFilesFromTheFront) {
    const struct {
        uint64_t wanted;
        int failing;  // number of the unlink that fails
        uint64_t removed;
        size_t left;
    } cases[] = {{0, 0, 10, 3},  {10, 0, 10, 3},    {11, 0, 30, 2},  {31, 0, 60, 1},
                 {30, 0, 30, 2}, {1000, 0, 100, 0}, {1000, 1, 0, 4}, {1000, 3, 30, 2}};
    start();
    for (const auto& c : cases) {
        SCOPED_TRACE(c.wanted);
        for (uint32_t i = 1; i <= 4; ++i) {
            add("f" + std::to_string(i), LT_DUMP, 10 * i);
        }
        if (c.failing) {
            faults::fail(faults::UNLINK, c.failing, EIO);
        }
        EXPECT_EQ(c.removed, m_dir->trim(c.wanted));
        EXPECT_EQ(c.left, m_dir->files().size());
        EXPECT_EQ(100 - c.removed, m_dir->size());
        faults::reset();
        m_dir->trim(1000);
    }
}

TEST_F(CpDirectoryTest, TrimWorkingDir) {
    start();
    LogFile* first = m_dir->create_log_file();
    first->set_size(10);
    for (int i = 1; i <= 4; ++i) {
        faults::set_time(NOW + i);
        m_dir->rotate_logs();
        m_dir->create_log_file()->set_size(10);
    }
    m_dir->rotate_logs();
    add("cp_wcn.version", LT_VERSION, 10);
    add("iq.bin", LT_WCDMA_IQ, 10);
    ObjectRef<LogFile> dump(add("ring", LT_RINGBUF, 10));
    faults::set_time(NOW + 20);
    m_dir->create_log_file()->set_size(10);
    ASSERT_EQ("5 4 3 2 1 cp_wcn iq ring 0 ", numbers());
    EXPECT_EQ(20u, m_dir->trim_working_dir(20));
    EXPECT_EQ("3 2 1 cp_wcn iq ring 0 ", numbers());  // the first follows on the oldest
    EXPECT_TRUE(m_root.exists(DIR_REL + "3-cp_wcn-2016-03-01_09-15-00.log"));
    // A request for nothing still takes one; a failure stops the walk, the files stay.
    EXPECT_EQ(10u, m_dir->trim_working_dir(0));
    EXPECT_EQ("2 1 cp_wcn iq ring 0 ", numbers());
    faults::fail(faults::UNLINK, 2, EIO);
    EXPECT_EQ(10u, m_dir->trim_working_dir(1000));
    EXPECT_EQ("1 cp_wcn iq ring 0 ", numbers());
    EXPECT_EQ(10u, m_dir->trim_working_dir(1000));
    EXPECT_FALSE(dump);
    EXPECT_EQ(0u, m_dir->trim_working_dir(1000));  // only protected files are left
    EXPECT_EQ("1 cp_wcn iq 0 ", numbers());
    EXPECT_EQ(40u, m_dir->size());
    // A closed current log is protected no more; a vanished first one leaves no mark.
    m_dir->close_log_file();
    EXPECT_EQ(10u, m_dir->trim_working_dir(5));
    m_dir->file_removed(first);
    EXPECT_EQ(0u, m_dir->trim_working_dir(1000));
    EXPECT_EQ("cp_wcn iq ", numbers());
}

}  // namespace
