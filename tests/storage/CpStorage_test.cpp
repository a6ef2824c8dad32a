// SPDX-License-Identifier: Apache-2.0

#include "storage/CpStorage.h"

#include <errno.h>

#include "core/Multiplexer.h"
#include "storage/StorageFixture.h"
#include "storage/paths.h"

namespace {

const std::string SET = "2016-03-01-09-15-00/";
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
        m_store->set_new_dir_callback([](CpChannel* channel) {
            EXPECT_EQ(channel, &s_test->m_channel);
            s_test->m_events += "D";
            s_test->m_in_hook();
        });
        m_store->set_new_log_callback([](CpChannel*, LogFile* file) {
            EXPECT_EQ(file, s_test->m_store->current_file());
            s_test->m_events += "L";
        });
    }

    int write(const std::string& data) { return m_store->write(data.data(), data.size()); }
    Names files(const std::string& set) { return m_root.list(set + "/cp_gnss"); }
    std::string content(const std::string& name) {
        return m_root.read_file(INT + SET + "cp_gnss/" + name);
    }
    static std::string log_name(int number, int second) {
        return std::to_string(number) + "-cp_gnss-2016-03-01_09-15-" +
               std::to_string(100 + second).substr(1) + ".log";
    }

    static CpStorageTest* s_test;
    NamedChannel m_other_channel{"cp_wcn"};
    CpStorage* m_other;
    std::string m_events;
    void (*m_in_hook)() = [] {};
};

CpStorageTest* CpStorageTest::s_test;

TEST_F(CpStorageTest, FirstWriteAndRotation) {
    m_store->flush();
    m_store->stop();
    EXPECT_EQ(write("12345"), 5);
    EXPECT_EQ(m_events, "DL");
    EXPECT_EQ(m_mgr.media_type(), MT_INTERNAL);
    EXPECT_EQ(content(log_name(0, 0)), "");
    m_store->flush();
    EXPECT_EQ(content(log_name(0, 0)), "12345");
    m_store->stop();
    m_store->stop();
    // After a stop the older file is renumbered; the directory is not new.
    m_mgr.set_file_size(100);
    const std::string data = pattern_bytes(99, 1);
    EXPECT_EQ(write_later(data), 99);
    EXPECT_NE(m_store->current_file(), nullptr);
    EXPECT_EQ(write("x"), 1);
    EXPECT_EQ(m_store->current_file(), nullptr);
    EXPECT_EQ(content(log_name(0, 1)), data + "x");
    EXPECT_EQ(write_later(std::string(200, 'y')), 200);
    EXPECT_EQ(write_later("z"), 1);
    EXPECT_EQ(files(INT + SET),
              (Names{log_name(0, 3), log_name(1, 2), log_name(2, 1), log_name(3, 0)}));
    EXPECT_EQ(m_events, "DLLLL");
    check_sums(internal());
    m_mgr.delete_storage(m_store);
    m_mgr.delete_storage(m_store);  // unknown by now
    EXPECT_EQ(content(log_name(0, 3)), "z");
}

// A file, its directory, its set or the whole log root deleted by somebody else.
TEST_F(CpStorageTest, Vanished) {
    const struct {
        const char* path;  // of what goes, behind the set's
        const char* events;
        bool set_stays;
        uint64_t set_extra;  // bytes that stay in the totals
        uint64_t media_extra;
        size_t files_left;
    } cases[] = {{"/cp_gnss/0*", "L", true, 7, 0, 2},
                 {"/cp_gnss", "DL", true, 7, 3, 1},
                 {"", "DL", false, 0, 0, 1},
                 {"/../../modem_log", "DL", false, 0, 0, 1}};
    for (const auto& c : cases) {
        for (bool other_cp_finds_out : {false, true}) {
            SCOPED_TRACE(std::string(c.path) + (other_cp_finds_out ? ", by another CP" : ""));
            m_mgr.clear_all();
            write_later("123");
            m_store->stop();
            write_later("1234567");
            m_other->write("12", 2);
            ObjectRef<LogFile> current(m_store->current_file());
            const std::string set = set_names(internal()).back();
            ASSERT_EQ(system(("rm -fr " + m_root.path(INT + set + c.path)).c_str()), 0);
            faults::set_time(++m_now);
            if (other_cp_finds_out) {  // its file discards what is gone, and this one's file
                EXPECT_NE(m_other->create_file("d", LT_DUMP, MT_NONE), nullptr);
                EXPECT_EQ(static_cast<bool>(current), c.set_stays);
            }
            m_events.clear();
            EXPECT_EQ(write("next"), 4);
            EXPECT_EQ(m_events, c.events);
            EXPECT_FALSE(current);
            EXPECT_EQ(set_names(internal()).back() == set, c.set_stays);
            const Names left = files(INT + set_names(internal()).back());
            ASSERT_EQ(left.size(), c.files_left);
            EXPECT_EQ(left[0][0], '0') << "the log before it was renumbered";
            check_sums(internal(), c.set_extra, c.media_extra);
        }
    }
}

TEST_F(CpStorageTest, QuotaWithoutOverwrite) {
    m_mgr.set_overwrite(false);
    m_mgr.set_data_part_size(10);
    EXPECT_EQ(write("0123456789"), 10);
    EXPECT_EQ(write("abcde"), 5);  // crosses the limit, still taken, and flushed
    EXPECT_EQ(content(log_name(0, 0)), "0123456789abcde");
    EXPECT_EQ(write("lost"), -1);
    EXPECT_EQ(write("lost"), -1);
    EXPECT_EQ(m_store->check_quota(MT_NONE), -1);
    EXPECT_EQ(m_store->check_quota(MT_EXTERNAL), 0);
    m_mgr.set_data_part_size(1000);
    EXPECT_EQ(write("kept"), 4);
    // The check was passed: the next write that crosses a limit is taken again.
    m_mgr.set_data_part_size(1);
    EXPECT_EQ(write("!"), 1);
    EXPECT_EQ(write("lost"), -1);
    EXPECT_EQ(content(log_name(0, 0)), "0123456789abcdekept!");
    // What somebody deleted is let go of at the first refusal after a success.
    m_mgr.set_data_part_size(100);
    EXPECT_EQ(m_store->check_quota(MT_NONE), 0);
    m_store->stop();
    remove_tree(m_root.path(INT + SET + "cp_gnss/" + log_name(0, 0)).c_str());
    m_mgr.set_data_part_size(1);
    EXPECT_EQ(m_store->check_quota(MT_NONE), 0);
}

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

TEST_F(CpStorageTest, FullMedium) {
    const std::string block(70000, 'x'), old_set = INT + "2016-02-01-00-00-00";
    m_mgr.set_file_size(1000);
    const struct {
        uint64_t old_size;
        bool enough;  // that is half a file's size and can be freed
    } cases[] = {{500, true}, {499, false}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.old_size);
        m_mgr.clear_all();
        put(old_set + "/cp/f", c.old_size);
        internal().clear();
        internal().stat();
        m_mgr.set_overwrite(false);
        EXPECT_EQ(internal().free_space(), -1);
        EXPECT_TRUE(m_root.exists(old_set));
        m_mgr.set_overwrite(true);
        EXPECT_EQ(write_later("abc"), 3);
        faults::fail(faults::WRITEV, 1, ENOSPC);
        const int flushes = faults::calls(faults::WRITE);
        EXPECT_EQ(write(block), -2);
        EXPECT_FALSE(m_root.exists(old_set));
        // If not, what is staged is flushed, and writing goes on once the quota is met.
        EXPECT_EQ(faults::calls(faults::WRITE) - flushes, c.enough ? 0 : 1);
        m_mgr.set_overwrite(false);
        m_mgr.set_data_part_size(1);
        EXPECT_EQ(write(block), c.enough ? 70000 : -1);
        m_mgr.set_data_part_size(0);
        EXPECT_EQ(write(block), 70000);
        m_store->stop();
        check_sums(internal());
    }
}

// A service started on a full medium lost everything: space was freed only after a failed
// write, and no file to write could be made.
TEST_F(CpStorageTest, MediumIsFullWhenAFileHasToBeMade) {
    const struct {
        faults::Call call;
        const char* path;  // of what cannot be made
    } cases[] = {{faults::MKDIR, "/2016-"}, {faults::MKDIR, "/cp_gnss"}, {faults::OPEN, "/0-"}};
    m_mgr.set_file_size(1000);
    for (const auto& c : cases) {
        SCOPED_TRACE(c.path);
        m_mgr.clear_all();
        for (const char* day : {"01", "02", "03", "04"}) {
            put(INT + "2016-02-" + day + "-00-00-00/cp/f", 1000);
        }
        internal().clear();
        ASSERT_EQ(internal().stat(), 0);
        // Full until room was made twice.
        faults::only_on(c.path);
        faults::fail(c.call, 1, ENOSPC, 2);
        int lost = 0;
        while (write_later("data") < 0) {
            ASSERT_LT(++lost, 3);
        }
        EXPECT_EQ(m_root.list(INT)[0], "2016-02-03-00-00-00");
        // Crash material does not wait for a next write.
        ASSERT_EQ(system(("rm -fr " + m_root.path(INT + "2016-03*")).c_str()), 0);
        faults::fail(c.call, 1, ENOSPC);
        EXPECT_NE(m_store->create_file("0-dump", LT_DUMP), nullptr);
        EXPECT_EQ(m_root.list(INT)[0], "2016-02-04-00-00-00");
        faults::reset();
        check_sums(internal());
    }
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
    EXPECT_FALSE(log.has(forced));
}

// A medium whose log root somebody deleted while it was not in use was never taken again.
TEST_F(CpStorageTest, LogRootIsMadeAgain) {
    plug_card();
    EXPECT_EQ(write_later("1"), 1);
    m_mgr.clear_all();
    remove_tree(m_root.path("sd/modem_log").c_str());
    EXPECT_EQ(write_later("2"), 1);
    EXPECT_EQ(m_mgr.media_type(), MT_EXTERNAL);
    // The card's place is empty for a while, though it counts as mounted.
    m_mgr.clear_all();
    ASSERT_EQ(rename(m_root.path("sd").c_str(), m_root.path("pulled").c_str()), 0);
    EXPECT_EQ(write_later("3"), 1);
    EXPECT_EQ(m_mgr.media_type(), MT_INTERNAL);
    ASSERT_EQ(rename(m_root.path("pulled").c_str(), m_root.path("sd").c_str()), 0);
    EXPECT_EQ(write_later("4"), 1);
    EXPECT_EQ(m_mgr.media_type(), MT_EXTERNAL);
}

// A log root given up because it could not be accessed, but there after all, is counted again.
// Other failures of access are passing ones.
TEST_F(CpStorageTest, FailedAccessIsNotAlwaysALoss) {
    const struct {
        int error;
        bool vanished;
    } cases[] = {{EIO, false}, {ENOMEM, false}, {EACCES, true}, {ENOENT, true}, {ELOOP, true}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.error);
        m_mgr.clear_all();
        put(INT + "2016-02-01-00-00-00/cp/f", 100);
        internal().clear();
        ASSERT_EQ(internal().stat(), 0);
        write_later("12345");
        const LogFile* file = m_store->current_file();
        faults::fail(faults::ACCESS, 1, c.error, 2);  // that of the file, that of the log root
        EXPECT_EQ(write("678"), 3);
        EXPECT_EQ(m_store->current_file() != file, c.vanished);
        // What was lost from sight is set aside and counts.
        EXPECT_EQ(internal().size(), 108u);
        m_store->flush();
        EXPECT_EQ(files(INT + set_names(internal()).back()).size(), c.vanished ? 2u : 1u);
        check_sums(internal());
    }
}

TEST_F(CpStorageTest, CardComesAndGoes) {
    write("first");
    ObjectRef<LogFile> in_file(m_store->current_file());
    m_other->write("o", 1);
    plug_card();
    EXPECT_EQ(write_later("second"), 6);
    EXPECT_EQ(in_file->fd(), -1);  // closed, still listed
    EXPECT_EQ(m_other->current_file(), nullptr);
    EXPECT_EQ(content(log_name(0, 0)), "first");
    EXPECT_EQ(m_events, "DLDL");
    // A file for the internal medium leaves the medium in use alone.
    LogFile* dump = m_store->create_file("d.dmp", LT_DUMP, MT_INTERNAL);
    EXPECT_TRUE(dump && dump->dir()->set()->media() == &internal());
    ObjectRef<LogFile> ext_file(m_store->current_file());
    ObjectRef<LogFile> ext_dump(m_store->create_file("e.dmp", LT_DUMP, MT_NONE));
    EXPECT_EQ(ext_dump->dir()->set()->media(), &external());
    // Unmounted: the subscriber sees the objects, then they are gone.
    m_store->subscribe_ext_stor_umount_evt(
        &ext_file, [](void* ref) { EXPECT_TRUE(*static_cast<ObjectRef<LogFile>*>(ref)); });
    pull_card();
    EXPECT_EQ(write_later("third"), 5);
    EXPECT_FALSE(ext_file || ext_dump);
    EXPECT_EQ(internal().sets().size(), 2u);  // a new one, though there was one from before
    m_store->unsubscribe_ext_stor_umount_evt(&ext_file);
    // Back again: the card is scanned afresh.
    m_root.write_file("sd/modem_log/2016-01-01-00-00-00/cp_gnss/old", "123");
    plug_card();
    EXPECT_EQ(write_later("4"), 1);
    EXPECT_EQ(external().sets().size(), 3u);
    check_sums(internal());
    check_sums(external());
}

// A card that was known but not in use when it was replaced was not used again: what was
// known of the first one hid the second.
TEST_F(CpStorageTest, CardIsReplacedWhileNotInUse) {
    m_root.write_file("sd/modem_log/2016-01-01-00-00-00/cp/f", "12345");
    plug_card();
    ASSERT_EQ(external().stat(), 0);
    pull_card();
    EXPECT_EQ(write_later("1"), 1);
    EXPECT_EQ(external().sets().size(), 0u);
    plug_card();
    EXPECT_EQ(write_later("2"), 1);
    // In use until its log root cannot be written, then replaced.
    remove_tree(m_root.path("sd/modem_log").c_str());
    m_root.write_file("sd/modem_log", "");
    EXPECT_EQ(write_later("x"), -1);
    m_mgr.clear_all();
    EXPECT_EQ(write_later("3"), 1);
    EXPECT_EQ(m_mgr.media_type(), MT_INTERNAL);
    pull_card();
    ASSERT_EQ(unlink(m_root.path("sd/modem_log").c_str()), 0);
    EXPECT_EQ(write_later("4"), 1);
    plug_card();
    EXPECT_EQ(write_later("5"), 1);
    EXPECT_EQ(m_mgr.media_type(), MT_EXTERNAL);
    EXPECT_EQ(external().sets().size(), 1u);
}

// A card whose file system has become read-only, which is how cards die, lost every block
// for as long as it counted as mounted.
TEST_F(CpStorageTest, CardThatCanNoLongerBeWritten) {
    const struct {
        int error;
        bool directories;  // cannot be made either
    } cases[] = {{EROFS, true}, {EIO, true}, {ENODEV, true}, {EIO, false}};
    plug_card();
    for (const auto& c : cases) {
        SCOPED_TRACE(std::to_string(c.error) + (c.directories ? " all" : " files"));
        EXPECT_EQ(write_later("1"), 1);
        ASSERT_EQ(m_mgr.media_type(), MT_EXTERNAL);
        m_store->stop();
        faults::only_on("/sd/");
        faults::fail(faults::OPEN, 1, c.error, 100000);
        if (c.directories) {
            faults::fail(faults::MKDIR, 1, c.error, 100000);
        }
        m_events.clear();
        EXPECT_EQ(write_later("x"), -1);  // the block that finds out
        const size_t sets = internal().sets().size();
        for (int i = 0; i < 20; ++i) {
            EXPECT_EQ(write_later("y"), 1);
            EXPECT_EQ(m_mgr.media_type(), MT_INTERNAL);
        }
        EXPECT_EQ(internal().sets().size(), sets + 1);
        EXPECT_EQ(m_events, "DL");
        // Crash material goes to the other medium at once.
        EXPECT_NE(m_store->create_file("a.dmp", LT_DUMP), nullptr);
        faults::reset();
        EXPECT_EQ(write_later("z"), 1);  // tried again with each block
        EXPECT_EQ(m_mgr.media_type(), MT_EXTERNAL);
        pull_card();
        write_later("i");
        plug_card();
    }
    EXPECT_EQ(write_later("1"), 1);
    m_store->stop();
    faults::only_on("/sd/");
    faults::fail(faults::OPEN, 1, EIO, 100000);
    EXPECT_NE(m_store->create_file("b.dmp", LT_DUMP), nullptr);
    EXPECT_EQ(m_mgr.media_type(), MT_INTERNAL);
}

// A card that seems to work each time it is tried, and fails then, is not tried from block to
// block.
TEST_F(CpStorageTest, CardThatKeepsFailingRests) {
    static Multiplexer mux;  // outlives the manager
    ASSERT_EQ(m_mgr.init(m_root.path("sd").c_str(), nullptr, &mux), 0);
    plug_card();
    faults::only_on("/sd/modem_log/2");  // sets can be made, and files in the log root
    faults::fail(faults::OPEN, 1, EIO, 100000);
    int lost = 0;
    for (int i = 0; i < 20; ++i) {
        lost += write_later("x") < 0;
    }
    EXPECT_EQ(lost, 2);
    EXPECT_EQ(m_mgr.media_type(), MT_INTERNAL);
    // Another card does not wait.
    faults::reset();
    pull_card();
    write_later("y");
    plug_card();
    EXPECT_EQ(write_later("z"), 1);
    EXPECT_EQ(m_mgr.media_type(), MT_EXTERNAL);
}

// The hook for a new directory makes a file, as for a version record, and so finds the
// card in: the data goes to a new log file there.
TEST_F(CpStorageTest, MediumChangesInsideTheHook) {
    m_in_hook = [] {
        s_test->m_in_hook = [] {};
        s_test->plug_card();
        EXPECT_NE(s_test->m_store->create_file("cp.version", LT_VERSION, MT_NONE), nullptr);
    };
    EXPECT_EQ(write("data"), 4);
    EXPECT_EQ(m_events, "DL");
    EXPECT_EQ(files("sd/modem_log/" + SET), (Names{log_name(0, 0), "cp.version"}));
    m_store->flush();
    EXPECT_EQ(m_root.read_file("sd/modem_log/" + SET + "cp_gnss/" + log_name(0, 0)), "data");
    EXPECT_EQ(content(log_name(0, 0)), "");
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
