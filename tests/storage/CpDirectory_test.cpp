// SPDX-License-Identifier: Apache-2.0

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

// Kinds that share a second: the logs by falling number, whatever stands between them. Of one
// number, what was set aside is older.
// Unknown files lead, each ahead of the ones found before.
TEST_F(CpDirectoryTest, ScanOrder) {
    const std::string early = "smsg_2016-03-01_09-59-59.log", late = "a_2016-03-01_10-00-01.dmp",
                      next_hour = log_name(41, "11-00-00"), aside = log_name(0, "10-00-00-1"),
                      aside_later = log_name(0, "10-00-00-2"),
                      dump = "mini_dump_2016-03-01_10-00-00.";
    for (int i = 0; i < 40; ++i) {
        m_root.write_file(DIR_REL + log_name((i * 7) % 40), "x");
        m_root.write_file(DIR_REL + dump + std::to_string(i), "x");
        m_root.write_file(DIR_REL + "u" + std::to_string(i), "x");
    }
    for (const std::string& name : {early, late, next_hour, aside, aside_later}) {
        m_root.write_file(DIR_REL + name, "x");
    }
    put(DIR_REL + "a.version", (1ull << 32) + 1);
    Names expected;
    DIR* const dir = opendir(m_root.path(DIR_REL).c_str());
    ASSERT_NE(dir, nullptr);
    while (const struct dirent* entry = readdir(dir)) {
        if (entry->d_name[0] == 'u') {
            expected.insert(expected.begin(), entry->d_name);
        }
    }
    closedir(dir);
    expected.push_back(early);
    for (int number = 39; number > 0; --number) {
        expected.push_back(log_name(number));
    }
    expected.insert(expected.end(),
                    {aside, aside_later, log_name(0), late, next_hour, "a.version"});
    ASSERT_NO_FATAL_FAILURE(start());
    Names names = file_names(*m_dir);
    EXPECT_EQ(names.size(), 126u);
    names.erase(std::remove_if(names.begin(), names.end(),
                               [&](const std::string& name) { return name.find(dump) == 0; }),
                names.end());
    EXPECT_EQ(names, expected);
    EXPECT_EQ(m_dir->size(), (1ull << 32) + 126);
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
        ASSERT_EQ(link(m_root.path("file").c_str(), m_root.path(DIR_REL + expected[at]).c_str()),
                  0);
    }
    g_comparisons = 0;
    ASSERT_NO_FATAL_FAILURE(start());
    EXPECT_GT(g_comparisons, num);
    EXPECT_LT(g_comparisons, 100 * num);
    EXPECT_EQ(file_names(*m_dir), expected);
}

// A file of the same second and name was written over when renaming it had failed, or when
// no list knew it.
TEST_F(CpDirectoryTest, NoFileIsEverWrittenOver) {
    ASSERT_NO_FATAL_FAILURE(start());
    const std::string name = log_name(0, "09-15-00"), aside = "0-cp_wcn-2016-03-01_09-15-00-1.log";
    // Not listed: set aside, and it counts from now on.
    m_root.write_file(DIR_REL + name, "stranger");
    LogFile* first = m_dir->create_log_file();
    first->write("first", 5);
    EXPECT_EQ(file_names(*m_dir), (Names{aside, name}));
    EXPECT_EQ(m_root.read_file(DIR_REL + aside), "stranger");
    EXPECT_EQ(m_dir->size(), 13u);
    // Listed: likewise.
    EXPECT_NE(m_dir->create_log_file(), nullptr);
    first->close();
    EXPECT_EQ(m_root.read_file(DIR_REL + "0-cp_wcn-2016-03-01_09-15-00-2.log"), "first");
    // Listed, but gone: dropped. What cannot be moved keeps its name; the new file has another.
    ObjectRef<LogFile> gone(add("a.dmp", LT_DUMP, 7));
    unlink(m_root.path(DIR_REL + "a.dmp").c_str());
    LogFile* stuck = m_dir->create_file("a.dmp", LT_DUMP);
    EXPECT_FALSE(gone);
    stuck->write("stuck", 5);
    faults::fail(faults::RENAME, 1, EIO);
    EXPECT_STREQ(m_dir->create_file("a.dmp", LT_DUMP)->name().string(), "a-3.dmp");
    EXPECT_STREQ(stuck->name().string(), "a.dmp");
    m_dir->create_file("a.dmp", LT_DUMP);
    stuck->close();
    EXPECT_EQ(m_root.read_file(DIR_REL + "a-4.dmp"), "stuck");
    EXPECT_EQ(m_dir->size(), 18u);
    check_sums(internal());
    faults::set_time(-1);
    EXPECT_EQ(m_dir->create_log_file(), nullptr);
}

// Numbers ran away while no log file could be made, and two files kept one number for ever
// when a renaming had failed once.
TEST_F(CpDirectoryTest, NumbersStayInOrder) {
    auto number = [&](int second) {
        faults::set_time(NOW + second);
        m_dir->rotate_logs();
    };
    ASSERT_NO_FATAL_FAILURE(start());
    for (int second : {0, 1, 2}) {
        number(second);
        m_dir->create_log_file()->set_size(10);
    }
    ASSERT_EQ(numbers(), "2 1 0 ");
    number(3);
    number(3);
    EXPECT_EQ(numbers(), "3 2 1 ");  // once: then the number 0 is free
    m_dir->create_log_file();
    faults::fail(faults::RENAME, 3, EIO);  // that of number 1
    number(4);
    m_dir->create_log_file();
    ASSERT_EQ(numbers(), "4 3 1 1 0 ");
    number(5);
    EXPECT_EQ(numbers(), "5 4 3 2 1 ");
    m_dir->create_log_file();
    // Deleted by somebody else: dropped, the others go on.
    unlink(m_root.path(DIR_REL + log_name(4, "09-15-01")).c_str());
    const uint64_t size = m_dir->size();
    number(6);
    EXPECT_EQ(numbers(), "6 4 3 2 1 ");
    EXPECT_EQ(m_dir->size(), size - 10);
    check_sums(internal());
    // A stranger has the name that a file is to take: the next number, and above it likewise.
    m_dir->create_log_file();
    m_root.write_file(DIR_REL + log_name(3, "09-15-04"), "stranger");
    number(7);
    EXPECT_EQ(numbers(), "7 6 5 4 2 1 ");
    EXPECT_EQ(m_root.read_file(DIR_REL + log_name(3, "09-15-04")), "stranger");
}

// Bytes that a file cannot write out as it goes have left the totals with the file already.
TEST_F(CpDirectoryTest, FilesThatGoAreCountedOnce) {
    ASSERT_NO_FATAL_FAILURE(start());
    faults::fail(faults::WRITE, 1, ENOSPC, 1000);
    bool new_dir = false;
    const auto stage_bytes = [&] {
        m_dir = m_set->prepare_cp_dir("cp_wcn", new_dir);
        m_dir->create_file("open.dmp", LT_DUMP)->write("12345", 5);
    };
    stage_bytes();
    EXPECT_EQ(m_set->trim(1), 5u);
    internal().dec_size(5);  // as MediaStorage::trim does
    check_sums(internal());
    stage_bytes();
    m_dir->remove_file(*m_dir->files().begin());
    check_sums(internal());
    stage_bytes();
    m_set->remove();
    m_set->create();
    m_set->prepare_cp_dir("cp_wcn", new_dir);
    EXPECT_EQ(m_set->size(), 0u);
    EXPECT_EQ(internal().size(), 5u);  // uncertain for now
}

TEST_F(CpDirectoryTest, TrimWorkingDir) {
    ASSERT_NO_FATAL_FAILURE(start());
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
    ASSERT_EQ(numbers(), "5 4 3 2 1 cp_wcn iq ring 0 ");
    EXPECT_EQ(m_dir->trim_working_dir(20), 20u);
    EXPECT_EQ(numbers(), "3 2 1 cp_wcn iq ring 0 ");  // the first follows on the oldest
    EXPECT_TRUE(m_root.exists(DIR_REL + "3-cp_wcn-2016-03-01_09-15-00.log"));
    // A request for nothing still takes one; a failure stops the walk, the files stay.
    EXPECT_EQ(m_dir->trim_working_dir(0), 10u);
    EXPECT_EQ(numbers(), "2 1 cp_wcn iq ring 0 ");
    faults::fail(faults::UNLINK, 2, EIO);
    EXPECT_EQ(m_dir->trim_working_dir(1000), 10u);
    EXPECT_EQ(numbers(), "1 cp_wcn iq ring 0 ");
    EXPECT_EQ(m_dir->trim_working_dir(1000), 10u);
    EXPECT_FALSE(dump);
    EXPECT_EQ(m_dir->trim_working_dir(1000), 0u);  // only protected files are left
    EXPECT_EQ(numbers(), "1 cp_wcn iq 0 ");
    EXPECT_EQ(m_dir->size(), 40u);
    // A closed current log is protected no more; a vanished first one leaves no mark.
    m_dir->close_log_file();
    EXPECT_EQ(m_dir->trim_working_dir(5), 10u);
    m_dir->file_removed(first);
    EXPECT_EQ(m_dir->trim_working_dir(1000), 0u);
    EXPECT_EQ(numbers(), "cp_wcn iq ");
}

}  // namespace
