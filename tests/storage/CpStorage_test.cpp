// SPDX-License-Identifier: Apache-2.0

#include "storage/CpStorage.h"

#include <errno.h>

#include "storage/StorageFixture.h"

namespace {

const std::string INT = "data/modem_log/";

class CpStorageTest : public StorageTest {
protected:
    CpStorageTest() {
        init();
        m_store = m_mgr.create_storage(&m_channel);
        m_other = m_mgr.create_storage(&m_other_channel);
    }

    Names files(const std::string& set) { return m_root.list(set + "/cp_gnss"); }
    static std::string log_name(int number, int second) {
        return std::to_string(number) + "-cp_gnss-2016-03-01_09-15-" +
               std::to_string(100 + second).substr(1) + ".log";
    }

    NamedChannel m_other_channel{"cp_wcn"};
    CpStorage* m_other;
};

TEST_F(CpStorageTest, QuotaTrimsTheOldest) {
    LogCapture log;
    m_mgr.set_file_size(10);
    m_mgr.set_data_part_size(50);
    for (int i = 0; i < 30; ++i) {
        EXPECT_EQ(write_later("0123456789"), 10);
    }
    EXPECT_TRUE(log.has("int MediaStorage::check_quota(): data large: 60/0M\n"));
    // The first log is still there and numbered behind the oldest of the others.
    EXPECT_EQ(files(INT + set_names(internal()).back()),
              (Names{log_name(0, 30), log_name(1, 29), log_name(2, 28), log_name(3, 27),
                     log_name(4, 1)}));
}

// With the default sizes the first and the newest files of three co-processors fill the
// quota; trimming spares them, and every block was refused until somebody cleared the logs.
TEST_F(CpStorageTest, SparedFilesDoNotEndTheLogging) {
    m_mgr.set_file_size(1000);
    m_mgr.set_data_part_size(2500);
    const std::string block(100, 'x');
    int refused = 0;
    for (int i = 0; i < 600; ++i) {
        faults::set_time(++m_now);
        for (CpStorage* store : {m_store, m_other}) {
            refused += store->write(block.data(), block.size()) != 100;
        }
        EXPECT_LE(internal().size(), 2700u);  // each may cross the limit once
    }
    EXPECT_EQ(refused, 0);
    check_sums(internal());
    // One new set at the most for each file size of data that arrived.
    m_mgr.set_data_part_size(150);
    const std::string forced = "make_room_with_new_set(): nothing else is left to trim, new set ";
    LogCapture log;
    int written = 0;
    for (int i = 0; i < 100; ++i) {
        written += write_later(block) == 100;
    }
    EXPECT_LE(log.count(forced), 11u);
    EXPECT_GE(written, 10);
    // Nothing is forced without overwriting.
    m_mgr.set_overwrite(false);
    log.clear();
    for (int i = 0; i < 30; ++i) {
        write_later(block);
    }
    EXPECT_EQ(errno, EDQUOT);
    EXPECT_FALSE(log.has(forced));
}

}  // namespace
