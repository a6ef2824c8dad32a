// SPDX-License-Identifier: Apache-2.0

#include "storage/CpStorage.h"

#include <errno.h>

#include "core/Multiplexer.h"
#include "storage/StorageFixture.h"
#include "storage/paths.h"

namespace {

const std::string INT = "data/modem_log/";

class CpStorageTest : public StorageTest {
public:  // for the hooks, which are plain functions
    using StorageTest::m_channel;
    using StorageTest::m_store;
    using StorageTest::plug_card;

    CpStorageTest() {
        s_test = this;
        init();
        m_store = m_mgr.create_storage(&m_channel);
        m_other = m_mgr.create_storage(&m_other_channel);
        m_store->set_new_dir_callback(
            [](CpChannel* channel) { EXPECT_EQ(channel, &s_test->m_channel); });
        m_store->set_new_log_callback(
            [](CpChannel*, LogFile* file) { EXPECT_EQ(file, s_test->m_store->current_file()); });
    }

    int write(const std::string& data) { return m_store->write(data.data(), data.size()); }
    Names files(const std::string& set) { return m_root.list(set + "/cp_gnss"); }
    static std::string log_name(int number, int second) {
        return std::to_string(number) + "-cp_gnss-2016-03-01_09-15-" +
               std::to_string(100 + second).substr(1) + ".log";
    }

    static CpStorageTest* s_test;
    NamedChannel m_other_channel{"cp_wcn"};
    CpStorage* m_other;
};

CpStorageTest* CpStorageTest::s_test;

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

// One run through everything that makes, moves, fills and deletes files.
class Scenario : public CpStorageTest {
public:
    Scenario() {
        for (int i = 1; i < 4; ++i) {
            put(INT + "2016-02-0" + std::to_string(i) + "-00-00-00/cp_gnss/f", 50000);
        }
        internal().stat();
        m_mgr.set_file_size(100000);
        m_mgr.set_data_part_size(260000);
        m_mgr.set_sd_size(120000);
    }
    void TestBody() override {}

    void go() {
        for (int i = 0; i < 12; ++i) {
            write_later(pattern_bytes(i % 3 == 0 ? 70000 : 40000, 1));
            m_other->write("some text", 9);
            if (i == 5 || i == 9) {
                save("a.dmp");
                plug_card();
            } else if (i == 7) {
                pull_card();
            }
        }
        save("b.dmp");
    }
    // The totals are right, and every listed file is there, of the size counted unless
    // bytes were refused by the system.
    void check(bool sizes) {
        m_store->flush();
        m_other->flush();
        for (const MediaStorage* media : {&internal(), &external()}) {
            check_sums(*media);
            for (const CpSetDirectory* set : media->sets()) {
                for (const CpDirectory* dir : set->dirs()) {
                    for (const LogFile* file : dir->files()) {
                        struct stat st;
                        const JoinedPath path(dir->path(), file->name());
                        EXPECT_TRUE(::stat(path.string(), &st) == 0 &&
                                    (!sizes || file->size() == st.st_size));
                    }
                }
            }
        }
    }
    void check_goes_on() {
        write_later("x");  // may still meet the consequences
        const std::string data = pattern_bytes(1000, 9);
        EXPECT_EQ(write_later(data), 1000);
        m_store->flush();
        const LogFile* file = m_store->current_file();
        const JoinedPath path(file->dir()->path(), file->name());
        const std::string all = m_root.read_file(path.string() + m_root.root().size());
        EXPECT_TRUE(all.size() >= 1000 && all.substr(all.size() - 1000) == data);
    }

private:
    void save(const char* name) {
        ObjectRef<LogFile> file(m_store->create_file(name, LT_DUMP, MT_NONE));
        if (file && (file->write(pattern_bytes(66000, 2).data(), 66000) != 66000)) {
            file->dir()->remove_file(file.get());
        } else if (file) {
            file->close();
        }
    }
};

// A failed access() looks like something vanished: the totals may then keep what was lost
// from sight, but the writing goes on.
TEST(CpStorageAnomalies, EveryCallFails) {
    LogCapture log;
    const size_t before = open_descriptors();
    for (int kind = faults::WRITE; kind <= faults::ACCESS; ++kind) {
        const faults::Call call = static_cast<faults::Call>(kind);
        bool hit = true;
        for (int n = 1; hit && !testing::Test::HasFailure(); ++n) {
            SCOPED_TRACE(std::to_string(kind) + " call " + std::to_string(n));
            Scenario run;
            const bool once = call == faults::ACCESS;
            faults::fail(call, n, call == faults::UNLINK ? EIO : ENOSPC, once ? 1 : 1 + n % 3);
            run.go();
            hit = faults::hit(call);
            EXPECT_TRUE(hit || n > 1) << "never called";
            faults::fail(call, 1000000, 0);
            for (int i = 0; i < 2; ++i) {
                if (call != faults::ACCESS) {
                    run.check(!hit || (call != faults::WRITE && call != faults::WRITEV));
                }
                run.check_goes_on();
            }
        }
    }
    EXPECT_EQ(open_descriptors(), before);
}

}  // namespace
