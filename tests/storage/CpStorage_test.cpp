#include "storage/CpStorage.h"

#include <errno.h>

#include "channels/GnssCpLogHandler.h"
#include "control/LogController.h"
#include "storage/StorageFixture.h"
#include "storage/paths.h"

namespace {

const std::string SET = "2016-03-01-09-15-00/";
const std::string INT = "data/modem_log/";

class CpStorageTest : public StorageTest {
public:  // for the hooks, which are plain functions
    using StorageTest::plug_card;

    CpStorageTest()
        : m_entry{"cp_gnss", CT_GNSS, true, 0, 0},
          m_other_entry{"cp_wcn", CT_WCN, true, 0, 0},
          m_channel(&m_ctrl, &m_ctrl.multiplexer(), &m_entry, &m_mgr),
          m_other_channel(&m_ctrl, &m_ctrl.multiplexer(), &m_other_entry, &m_mgr) {
        s_test = this;
        init();
        m_store = m_mgr.create_storage(&m_channel);
        m_other = m_mgr.create_storage(&m_other_channel);
        m_store->set_new_dir_callback([](LogPipeHandler* channel) {
            EXPECT_EQ(&s_test->m_channel, channel);
            s_test->m_events += "D";
            if (s_test->m_in_hook) {
                s_test->m_in_hook();
            }
        });
        m_store->set_new_log_callback([](LogPipeHandler* channel, LogFile* file) {
            EXPECT_EQ(&s_test->m_channel, channel);
            EXPECT_EQ(s_test->m_store->current_file(), file);
            s_test->m_events += "L";
        });
    }

    int write(const std::string& data) { return m_store->write(data.data(), data.size()); }
    // Writes in the next second.
    int write_later(const std::string& data) {
        faults::set_time(++m_now);
        return write(data);
    }
    Names files(const std::string& set, const char* cp = "/cp_gnss") {
        return m_root.list(set + cp);
    }
    static std::string log_name(int number, int second) {
        char name[64];
        snprintf(name, sizeof(name), "%d-cp_gnss-2016-03-01_09-15-%02d.log", number, second);
        return name;
    }

    static CpStorageTest* s_test;
    LogController m_ctrl;  // never started
    LogConfig::ConfigEntry m_entry;
    LogConfig::ConfigEntry m_other_entry;
    GnssCpLogHandler m_channel;
    GnssCpLogHandler m_other_channel;
    CpStorage* m_store;
    CpStorage* m_other;
    std::string m_events;
    void (*m_in_hook)() = nullptr;
    time_t m_now = NOW;
};

CpStorageTest* CpStorageTest::s_test;

TEST_F(CpStorageTest, FirstWrite) {
    EXPECT_EQ(0, m_store->check_quota(MT_NONE));
    EXPECT_EQ(nullptr, m_store->current_file());
    m_store->flush();
    m_store->stop();
    EXPECT_EQ(5, write("12345"));
    EXPECT_EQ("DL", m_events);
    EXPECT_EQ(MT_INTERNAL, m_mgr.media_type());
    EXPECT_EQ(Names{log_name(0, 0)}, files(INT + SET));
    EXPECT_EQ("", m_root.read_file(INT + SET + "cp_gnss/" + log_name(0, 0)));
    m_store->flush();
    EXPECT_EQ("12345", m_root.read_file(INT + SET + "cp_gnss/" + log_name(0, 0)));
    m_store->stop();
    m_store->stop();
    EXPECT_EQ(nullptr, m_store->current_file());
    // After a stop the older file is renumbered; the directory is not new.
    EXPECT_EQ(2, write_later("67"));
    EXPECT_EQ((Names{log_name(0, 1), log_name(1, 0)}), files(INT + SET));
    EXPECT_EQ("DLL", m_events);
    check_sums(internal());
    m_mgr.delete_storage(m_store);
    m_mgr.delete_storage(m_store);  // unknown by now
    EXPECT_EQ("67", m_root.read_file(INT + SET + "cp_gnss/" + log_name(0, 1)));
}

TEST_F(CpStorageTest, RotationAtTheSizeLimit) {
    m_mgr.set_file_size(100);
    const std::string data = pattern_bytes(99, 1);
    EXPECT_EQ(99, write(data));
    EXPECT_NE(nullptr, m_store->current_file());
    EXPECT_EQ(1, write("x"));
    EXPECT_EQ(nullptr, m_store->current_file());
    EXPECT_EQ(data + "x", m_root.read_file(INT + SET + "cp_gnss/" + log_name(0, 0)));
    EXPECT_EQ(200, write_later(std::string(200, 'y')));
    EXPECT_EQ(1, write_later("z"));
    EXPECT_EQ((Names{log_name(0, 2), log_name(1, 1), log_name(2, 0)}), files(INT + SET));
    EXPECT_EQ("DLLL", m_events);
    check_sums(internal());
}

// A file, its directory, its set or the whole log root deleted by somebody else.
TEST_F(CpStorageTest, Vanished) {
    const struct {
        const char* path;  // of what goes, behind the set's
        const char* events;
        uint64_t set_extra;  // what stays in the totals
        uint64_t media_extra;
        bool same_set;
    } cases[] = {{"/cp_gnss/0*", "L", 7, 0, true},
                 {"/cp_gnss", "DL", 7, 3, true},  // the file stays in the set's, the rest below
                 {"", "DL", 0, 0, false},
                 {"/../../modem_log", "DL", 0, 0, false}};
    for (const auto& c : cases) {
        for (const bool other_first : {false, true}) {
            SCOPED_TRACE(c.path + std::to_string(other_first));
            m_mgr.clear_all();
            write_later("123");
            m_store->stop();
            write_later("1234567");
            m_other->write("12", 2);
            ObjectRef<LogFile> current(m_store->current_file());
            const std::string set = set_names(internal()).back();
            ASSERT_EQ(0, system(("rm -fr " + m_root.path(INT + set + c.path)).c_str()));
            faults::set_time(++m_now);
            if (other_first) {
                // Another CP's file creation discards what is gone, and this one's file.
                EXPECT_NE(nullptr, m_other->create_file("d", LT_DUMP, MT_NONE));
                EXPECT_EQ(c.same_set, static_cast<bool>(current));
            }
            m_events.clear();
            EXPECT_EQ(4, write("next"));
            EXPECT_EQ(c.events, m_events);
            EXPECT_FALSE(current);
            // A fresh number 0; the log before it was not renumbered.
            EXPECT_EQ('0', m_store->current_file()->name().string()[0]);
            EXPECT_EQ(c.same_set, set == set_names(internal()).back());
            const Names left = files(INT + set_names(internal()).back());
            ASSERT_EQ(c.set_extra > 0 && c.media_extra == 0 ? 2u : 1u, left.size());
            EXPECT_EQ('0', left[0][0]);
            EXPECT_EQ('1', left.size() > 1 ? left[1][0] : '1');
            check_sums(internal(), c.set_extra, c.media_extra);
        }
    }
}

// A saver's file creation finds the CP directory gone while a write has it open.
TEST_F(CpStorageTest, OwnSaverDiscardsTheCurrentFile) {
    write("123");
    ASSERT_EQ(0, remove_tree(m_root.path(INT + SET + "cp_gnss").c_str()));
    LogFile* dump = m_store->create_file("d.dmp", LT_DUMP, MT_INTERNAL);
    EXPECT_NE(nullptr, dump);
    EXPECT_EQ(nullptr, m_store->current_file());
    EXPECT_EQ(2, write("12"));
    EXPECT_EQ("DLL", m_events);  // made for the dump: not a new directory for the log
}

TEST_F(CpStorageTest, QuotaWithoutOverwrite) {
    m_mgr.set_overwrite(false);
    m_mgr.set_data_part_size(10);
    EXPECT_EQ(10, write("0123456789"));
    EXPECT_EQ(5, write("abcde"));  // crosses the limit, still taken, and flushed
    const std::string path = INT + SET + "cp_gnss/" + log_name(0, 0);
    EXPECT_EQ("0123456789abcde", m_root.read_file(path));
    for (int i = 0; i < 3; ++i) {
        EXPECT_EQ(-1, write("lost"));
    }
    EXPECT_EQ(-1, m_store->check_quota(MT_NONE));
    EXPECT_EQ(0, m_store->check_quota(MT_EXTERNAL));
    EXPECT_EQ(15u, internal().size());
    m_mgr.set_data_part_size(1000);
    EXPECT_EQ(4, write("kept"));
    m_store->flush();
    // The check was passed: the next write that crosses a limit is taken again.
    m_mgr.set_data_part_size(1);
    EXPECT_EQ(1, write("!"));
    EXPECT_EQ(-1, write("lost"));
    EXPECT_EQ("0123456789abcdekept!", m_root.read_file(path));
}

TEST_F(CpStorageTest, QuotaTrimsTheOldest) {
    m_root.write_file(INT + "2016-02-01-00-00-00/cp/f", std::string(100, 'x'));
    internal().stat();
    m_mgr.set_file_size(10);
    m_mgr.set_data_part_size(50);
    for (int i = 0; i < 30; ++i) {
        EXPECT_EQ(10, write_later("0123456789"));
        EXPECT_LE(internal().size(), 120u);
    }
    EXPECT_EQ(50u, internal().size());
    // The first log is still there and numbered behind the oldest of the others.
    EXPECT_EQ(
        (Names{log_name(0, 30), log_name(1, 29), log_name(2, 28), log_name(3, 27), log_name(4, 1)}),
        files(INT + set_names(internal()).back()));
    check_sums(internal());
}

TEST_F(CpStorageTest, FullMedium) {
    const std::string block(70000, 'x');
    const struct {
        off_t old;  // bytes in an old set
        bool overwrite;
        bool enough;
    } cases[] = {{500, true, true}, {499, true, false}, {500, false, false}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.old);
        m_mgr.clear_all();
        m_mgr.set_overwrite(c.overwrite);
        m_mgr.set_file_size(1000);
        put(INT + "2016-02-01-00-00-00/cp/f", c.old);
        internal().clear();
        internal().stat();
        EXPECT_EQ(3, write_later("abc"));
        faults::fail(faults::WRITEV, 1, ENOSPC);
        const int flushes = faults::calls(faults::WRITE);
        EXPECT_EQ(-2, write(block));
        EXPECT_EQ(!c.overwrite, m_root.exists(INT + "2016-02-01-00-00-00"));
        // Not enough could be freed: what is staged is flushed, and writing goes on once
        // the quota is met.
        EXPECT_EQ(c.enough ? 0 : 1, faults::calls(faults::WRITE) - flushes);
        m_mgr.set_overwrite(false);
        m_mgr.set_data_part_size(1);
        if (!c.enough) {
            EXPECT_EQ(-1, write("x"));
            m_mgr.set_data_part_size(0);
        }
        EXPECT_EQ(70000, write(block));
        m_mgr.set_data_part_size(0);
        m_store->stop();
        check_sums(internal());
    }
}

TEST_F(CpStorageTest, OtherErrorsAreReturned) {
    EXPECT_EQ(1, write("a"));
    faults::fail(faults::WRITEV, 1, EIO);
    EXPECT_EQ(-1, write(std::string(70000, 'x')));
    faults::shorten(faults::WRITEV, 0);
    EXPECT_EQ(0, write(std::string(70000, 'x')));
    EXPECT_EQ(1, write("b"));
    m_store->stop();
    faults::fail(faults::OPEN, 1, ENOSPC);
    EXPECT_EQ(-1, write_later("c"));
    EXPECT_EQ(1, write_later("c"));
    check_sums(internal());
}

TEST_F(CpStorageTest, CardComesAndGoes) {
    m_root.write_file("sd/modem_log/2016-01-01-00-00-00/cp_gnss/old", "123");
    write("first");
    ObjectRef<LogFile> in_file(m_store->current_file());
    m_other->write("o", 1);
    plug_card();
    EXPECT_EQ(6, write_later("second"));
    EXPECT_EQ(-1, in_file->fd());  // closed, still listed
    EXPECT_EQ(nullptr, m_other->current_file());
    EXPECT_EQ("first", m_root.read_file(INT + SET + "cp_gnss/" + log_name(0, 0)));
    EXPECT_EQ("DLDL", m_events);
    EXPECT_EQ(2u, external().sets().size());
    // A file for the internal medium leaves the medium in use alone.
    LogFile* dump = m_store->create_file("d.dmp", LT_DUMP, MT_INTERNAL);
    ASSERT_NE(nullptr, dump);
    EXPECT_EQ(&internal(), dump->dir()->set()->media());
    EXPECT_EQ(MT_EXTERNAL, m_mgr.media_type());
    ObjectRef<LogFile> ext_file(m_store->current_file());
    ObjectRef<LogFile> ext_dump(m_store->create_file("e.dmp", LT_DUMP, MT_NONE));
    EXPECT_EQ(&external(), ext_dump->dir()->set()->media());
    // Unmounted: the subscriber sees the objects, then they are gone.
    static ObjectRef<LogFile>* seen;
    seen = &ext_file;
    int told = 0;
    m_store->subscribe_ext_stor_umount_evt(&told, [](void* client) {
        EXPECT_TRUE(*seen);
        EXPECT_GE((*seen)->fd(), 0);
        ++*static_cast<int*>(client);
    });
    m_store->subscribe_media_change_evt(
        [](void* client, MediaType) { *static_cast<int*>(client) += 10; }, &told);
    pull_card();
    EXPECT_EQ(5, write_later("third"));
    EXPECT_EQ(11, told);
    EXPECT_FALSE(ext_file);
    EXPECT_FALSE(ext_dump);
    EXPECT_EQ(2u, internal().sets().size());  // a new one, though there was one from before
    EXPECT_EQ("second",
              m_root.read_file("sd/modem_log/2016-03-01-09-15-01/cp_gnss/" + log_name(0, 1)));
    m_store->unsubscribe_ext_stor_umount_evt(&told);
    m_store->unsubscribe_media_change_evt(&told);
    m_store->unsubscribe_media_change_evt(&told);
    // Back again: the card is scanned afresh.
    plug_card();
    EXPECT_EQ(1, write_later("4"));
    EXPECT_EQ(11, told);
    EXPECT_EQ(3u, external().sets().size());
    check_sums(internal());
    check_sums(external());
}

TEST_F(CpStorageTest, CardFlapsWithinOneSecond) {
    for (int i = 0; i < 5; ++i) {
        plug_card();
        EXPECT_EQ(1, write("x"));
        pull_card();
        EXPECT_EQ(1, write("y"));
    }
    m_store->stop();
    EXPECT_EQ(1u, internal().sets().size());
    EXPECT_EQ(
        (Names{log_name(0, 0), log_name(1, 0), log_name(2, 0), log_name(3, 0), log_name(4, 0)}),
        files(INT + SET));
    EXPECT_EQ(5u, internal().size());
    for (const std::string& name : files(INT + SET)) {
        EXPECT_EQ("y", m_root.read_file(INT + SET + "cp_gnss/" + name));
    }
}

// The hook for a new directory makes a file, as for a version record, and so finds the
// card in: the data goes to a new log file there.
TEST_F(CpStorageTest, MediumChangesInsideTheHook) {
    m_in_hook = [] {
        s_test->m_in_hook = nullptr;
        s_test->plug_card();
        EXPECT_NE(nullptr, s_test->m_store->create_file("cp.version", LT_VERSION, MT_NONE));
    };
    EXPECT_EQ(4, write("data"));
    EXPECT_EQ("DL", m_events);
    EXPECT_EQ((Names{log_name(0, 0), "cp.version"}), files("sd/modem_log/" + SET));
    m_store->flush();
    EXPECT_EQ("data", m_root.read_file("sd/modem_log/" + SET + "cp_gnss/" + log_name(0, 0)));
    EXPECT_EQ("", m_root.read_file(INT + SET + "cp_gnss/" + log_name(0, 0)));
}

TEST_F(CpStorageTest, DumpBeforeTheFirstLog) {
    EXPECT_EQ(nullptr, m_store->create_file("x/y", LT_DUMP, MT_NONE));
    ASSERT_NE(nullptr, m_store->create_file("d.dmp", LT_DUMP, MT_NONE));
    EXPECT_EQ(3, write("abc"));
    EXPECT_EQ("L", m_events);
    m_mgr.clear_all();
    EXPECT_EQ(nullptr, m_store->current_file());
    EXPECT_EQ(3, write_later("abc"));
    EXPECT_EQ("LDL", m_events);
}

TEST_F(CpStorageTest, NoDescriptorGrowthOverRotations) {
    LogCapture log;
    m_mgr.set_file_size(1);
    m_mgr.set_data_part_size(4);
    EXPECT_EQ(1, write("x"));
    const size_t before = open_descriptors();
    for (int i = 0; i < 10000; ++i) {
        ASSERT_EQ(1, write("x"));
    }
    EXPECT_EQ(before, open_descriptors());
    EXPECT_EQ(4u, internal().size());
    check_sums(internal());
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
            if (i == 4) {
                save("a.dmp");
            }
            if (i == 5 || i == 9) {
                plug_card();
            } else if (i == 7) {
                pull_card();
            }
        }
        save("b.dmp");
    }
    // A medium's totals are right, and every listed file is on it, of the size counted
    // unless bytes were refused by the system.
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
                        ASSERT_EQ(0, ::stat(path.string(), &st)) << path.string();
                        if (sizes) {
                            EXPECT_EQ(file->size(), st.st_size) << path.string();
                        }
                    }
                }
            }
        }
    }
    void check_goes_on() {
        write_later("x");  // may still meet the consequences
        const std::string data = pattern_bytes(1000, 9);
        EXPECT_EQ(1000, write_later(data));
        m_store->flush();
        const LogFile* file = m_store->current_file();
        const std::string path =
            std::string(file->dir()->path().string()) + "/" + file->name().string();
        const std::string all = m_root.read_file(path.substr(m_root.root().size()));
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

TEST(CpStorageAnomalies, EveryCallFails) {
    LogCapture log;
    const size_t before = open_descriptors();
    for (int kind = 0; kind < faults::ACCESS; ++kind) {
        const faults::Call call = static_cast<faults::Call>(kind);
        for (int n = 1;; ++n) {
            SCOPED_TRACE(std::to_string(kind) + " call " + std::to_string(n));
            Scenario run;
            faults::fail(call, n, call == faults::UNLINK ? EIO : ENOSPC, 1 + n % 3);
            run.go();
            const bool hit = faults::hit(call);
            faults::fail(call, 1000000, 0);
            const bool bytes_lost = hit && (call == faults::WRITE || call == faults::WRITEV);
            run.check(!bytes_lost);
            run.check_goes_on();
            run.check(!bytes_lost);
            if (!hit || testing::Test::HasFailure()) {
                EXPECT_GT(n, 1) << "never called";
                break;
            }
        }
    }
    EXPECT_EQ(before, open_descriptors());
}

// A check that fails looks like something vanished; the totals may keep what was lost
// from sight, but never less than is listed, and the writing goes on.
TEST(CpStorageAnomalies, EveryAccessFailsOnce) {
    LogCapture log;
    for (int n = 1;; ++n) {
        SCOPED_TRACE(n);
        Scenario run;
        faults::fail(faults::ACCESS, n, EACCES);
        run.go();
        const bool hit = faults::hit(faults::ACCESS);
        run.check_goes_on();
        if (!hit || testing::Test::HasFailure()) {
            EXPECT_GT(n, 10);
            break;
        }
    }
}

}  // namespace
