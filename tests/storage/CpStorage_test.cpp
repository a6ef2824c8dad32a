// SPDX-License-Identifier: Apache-2.0

#include "storage/CpStorage.h"

#include <errno.h>

#include "storage/StorageFixture.h"

namespace {

class CpStorageTest : public StorageTest {
protected:
    CpStorageTest() {
        init();
        m_store = m_mgr.create_storage(&m_channel);
    }

    static std::string log_name(int number, int second) {
        return std::to_string(number) + "-cp_gnss-2016-03-01_09-15-" +
               std::to_string(100 + second).substr(1) + ".log";
    }
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
    const Names sets = m_root.list("data/modem_log");
    EXPECT_EQ(m_root.list("data/modem_log/" + sets.back() + "/cp_gnss"),
              (Names{log_name(0, 30), log_name(1, 29), log_name(2, 28), log_name(3, 27),
                     log_name(4, 1)}));
    // Nothing is forced without overwriting, though so much came that a new set may begin.
    m_mgr.set_overwrite(false);
    m_mgr.set_data_part_size(20);
    EXPECT_EQ(write_later("0123456789"), 10);
    EXPECT_EQ(write_later("0123456789"), -1);
    EXPECT_EQ(errno, EDQUOT);
    EXPECT_FALSE(log.has("new set"));
}

}  // namespace
