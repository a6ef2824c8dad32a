#include "storage/MediaStorage.h"

#include <errno.h>

#include "storage/StorageFixture.h"
#include "storage/paths.h"

namespace {

const std::string ROOT = "data/modem_log/";
const std::string TODAY = "2016-03-01-09-15-00";
constexpr off_t MIB = 1 << 20;

class MediaStorageTest : public StorageTest {
protected:
    LogFile* make(const char* cp, LogType type = LT_LOG, const char* name = "") {
        bool new_dir = false;
        return internal().create_file(cp, type, new_dir, name);
    }
};

TEST_F(MediaStorageTest, ScanOrder) {
    m_root.write_file(ROOT + "2016-03-02-08-00-00/cp/f", "12");
    m_root.write_file(ROOT + "2016-03-01-09-15-00/cp/f", "123");
    m_root.write_file(ROOT + "2016-03-01-09-15/cp/f", "1");
    m_root.write_file(ROOT + "zoo/cp/f", "1");
    m_root.write_file(ROOT + "\xff/cp/f", "1");
    m_root.write_file(ROOT + "modem_db.gz", "12345");
    ASSERT_EQ(0, symlink("zoo", m_root.path(ROOT + "link").c_str()));
    init();
    EXPECT_EQ(
        (Names{"2016-03-01-09-15", "2016-03-01-09-15-00", "2016-03-02-08-00-00", "zoo", "\xff"}),
        set_names(internal()));
    EXPECT_EQ(8u, internal().size());
    EXPECT_EQ(nullptr, internal().working_set());
    EXPECT_EQ(nullptr, internal().get_cp_dir("cp"));
    // What is written today joins the set of the same second that was found.
    EXPECT_EQ(TODAY, strrchr(internal().create_cp_set()->path().string(), '/') + 1);
    EXPECT_EQ(5u, internal().sets().size());
    make("cp")->write("12345", 5);
    EXPECT_EQ(8u, internal().working_set()->size());
    check_sums(internal());
}

TEST_F(MediaStorageTest, ScanFailures) {
    struct Case {
        const char* blocked;  // a plain file stands here
        bool kest_layout;
        int result;
    };
    for (const Case& c : {Case{"data/modem_log", false, -1}, Case{"data/kest", true, -1},
                          Case{"data/kest/modem_log", true, -1}, Case{"data/kest", false, 0}}) {
        TestRoot root;
        root.write_file(c.blocked, "");
        StorageManager mgr;
        mgr.set_kest_layout(c.kest_layout);
        EXPECT_EQ(c.result, mgr.init("", nullptr, nullptr)) << c.blocked;
        EXPECT_EQ(c.result == 0, mgr.get_media(MT_INTERNAL)->scanned());
    }
}

TEST_F(MediaStorageTest, OneObjectForOneSecond) {
    init();
    CpSetDirectory* set = internal().create_cp_set();
    ObjectRef<LogFile> first(make("cp"));
    EXPECT_EQ(0775u, mode_of(m_root.path("data/modem_log")));
    EXPECT_EQ(0775u, mode_of(m_root.path(ROOT + TODAY)));
    EXPECT_EQ(set, internal().create_cp_set());
    EXPECT_TRUE(first);
    EXPECT_EQ(1u, internal().sets().size());
    // Gone from the medium within the second: the same object, its directory made again.
    remove_tree(m_root.path(ROOT + TODAY).c_str());
    EXPECT_EQ(set, internal().create_cp_set());
    EXPECT_TRUE(m_root.exists(ROOT + TODAY));
    EXPECT_NE(nullptr, make("cp"));
    EXPECT_FALSE(first);
    faults::set_time(NOW + 1);
    EXPECT_NE(set, internal().create_cp_set());
    EXPECT_EQ((Names{TODAY, "2016-03-01-09-15-01"}), set_names(internal()));
    // Failures keep the working set.
    LogCapture log;
    set = internal().working_set();
    faults::fail(faults::MKDIR, 1, ENOSPC, 2);
    EXPECT_EQ(nullptr, internal().create_cp_set());
    faults::set_time(NOW + 2);
    EXPECT_EQ(nullptr, internal().create_cp_set());
    EXPECT_EQ(2u, log.count("CpSetDirectory* MediaStorage::create_cp_set(): create CP set " +
                            m_root.path(ROOT) + "2016-03-01-09-15-0"));
    EXPECT_EQ(2u, log.count(" failed [28("));
    faults::set_time(-1);
    EXPECT_EQ(nullptr, internal().create_cp_set());
    EXPECT_EQ(set, internal().working_set());
    EXPECT_EQ(2u, internal().sets().size());
}

// A set started before the medium was scanned is not found a second time.
TEST_F(MediaStorageTest, SetOlderThanTheScan) {
    m_root.write_file("sd/modem_log/2016-04-01-00-00-00/cp/f", "12");
    m_root.write_file("sd/modem_log/2016-02-01-00-00-00/cp/f", "12");
    init();
    EXPECT_FALSE(external().scanned());
    bool new_dir = false;
    ObjectRef<LogFile> file(external().create_file("cp", LT_DUMP, new_dir, "dump"));
    file->write("12345", 5);
    ASSERT_EQ(0, external().stat());
    EXPECT_TRUE(file);
    EXPECT_EQ((Names{"2016-02-01-00-00-00", TODAY, "2016-04-01-00-00-00"}), set_names(external()));
    EXPECT_EQ(9u, external().size());
    check_sums(external());
}

TEST_F(MediaStorageTest, Quota) {
    const struct {
        off_t quota;
        bool overwrite;
        int result;
        off_t left;
    } cases[] = {{0, true, 0, 30 * MIB},
                 {30 * MIB, true, 0, 30 * MIB},
                 {25 * MIB, false, -1, 30 * MIB},
                 {25 * MIB, true, 0, 25 * MIB},
                 {24 * MIB, true, 0, 20 * MIB},
                 {5 * MIB, true, 0, 5 * MIB},
                 {MIB, true, 0, 0},
                 {30 * MIB - 1, true, 0, 25 * MIB}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.quota);
        for (int i = 0; i < 6; ++i) {
            put(ROOT + "2016-02-0" + std::to_string(i / 2 + 1) + "-00-00-00/cp/f" +
                    std::to_string(i),
                5 * MIB);
        }
        internal().clear();
        init();
        internal().set_quota(static_cast<uint64_t>(c.quota));
        m_mgr.set_overwrite(c.overwrite);
        LogCapture log;
        EXPECT_EQ(c.result, internal().check_quota());
        EXPECT_EQ(static_cast<uint64_t>(c.left), internal().size());
        const size_t sets = static_cast<size_t>((c.left / MIB + 9) / 10);
        EXPECT_EQ(sets, internal().sets().size());
        EXPECT_EQ(sets, m_root.list(ROOT).size());
        EXPECT_EQ(c.left == 30 * MIB ? ""
                                     : "int MediaStorage::check_quota(): data large: 31457280/" +
                                           std::to_string(c.quota >> 20) + "M\n",
                  log.text().substr(std::min(log.text().find("int "), log.text().size())));
        check_sums(internal());
    }
}

// When only protected files are left the total stays above the quota.
TEST_F(MediaStorageTest, QuotaOfTheWorkingSet) {
    put(ROOT + "2016-02-01-00-00-00/cp/f", 100);
    init();
    make("cp")->set_size(100);
    ObjectRef<LogFile> dump(make("cp", LT_DUMP, "d.dmp"));
    dump->set_size(100);
    make("cp", LT_VERSION, "cp.version")->set_size(100);
    make("cp", LT_WCDMA_IQ, "iq")->set_size(100);
    internal().get_cp_dir("cp")->rotate_logs();
    faults::set_time(NOW + 1);
    make("cp")->set_size(100);
    EXPECT_EQ(600u, internal().size());
    internal().set_quota(450);
    EXPECT_EQ(0, internal().check_quota());
    EXPECT_FALSE(dump);
    EXPECT_EQ(400u, internal().size());
    internal().set_quota(399);
    EXPECT_EQ(-1, internal().check_quota());
    EXPECT_EQ(400u, internal().size());
    EXPECT_EQ(Names{TODAY}, m_root.list(ROOT));
    check_sums(internal());
    // A set no longer written on is trimmed before the new one, its protected files too.
    CpSetDirectory* old = internal().working_set();
    internal().create_cp_set();
    EXPECT_NE(old, internal().working_set());
    EXPECT_EQ(0, internal().check_quota());
    EXPECT_EQ(300u, internal().size());
    internal().set_quota(1);
    EXPECT_EQ(0, internal().check_quota());
    EXPECT_EQ(Names{"2016-03-01-09-15-01"}, m_root.list(ROOT));
}

TEST_F(MediaStorageTest, FreeSpace) {
    const struct {
        off_t size;
        bool overwrite;
        int result;
    } cases[] = {{5 * MIB / 2, true, 0}, {5 * MIB / 2 - 1, true, -1}, {5 * MIB, false, -1}};
    m_mgr.set_file_size(5 * MIB);
    for (const auto& c : cases) {
        put(ROOT + "2016-02-01-00-00-00/cp/f", c.size);
        internal().clear();
        init();
        internal().set_overwrite(c.overwrite);
        EXPECT_EQ(c.result, internal().free_space());
        EXPECT_EQ(!c.overwrite, m_root.exists(ROOT + "2016-02-01-00-00-00"));
        check_sums(internal());
    }
}

TEST_F(MediaStorageTest, Clear) {
    for (const char* name : {"2016-02-01-00-00-00/cp/f", "modem_db.gz", "sha1.txt", "zoo/cp/f"}) {
        m_root.write_file(ROOT + name, "12");
    }
    init();
    ObjectRef<LogFile> file(make("cp"));
    internal().clear();
    EXPECT_FALSE(file);
    EXPECT_FALSE(internal().scanned());
    EXPECT_EQ(5u, m_root.list(ROOT).size());
    EXPECT_EQ(0, internal().stat());
    EXPECT_EQ(3u, internal().sets().size());
    EXPECT_EQ(4u, internal().size());
    file = make("cp");
    internal().clear_all();
    EXPECT_FALSE(file);
    EXPECT_TRUE(internal().scanned());
    EXPECT_EQ(nullptr, internal().working_set());
    EXPECT_EQ((Names{"modem_db.gz", "sha1.txt", "zoo"}), m_root.list(ROOT));
    EXPECT_EQ("rm -fr " + m_root.path(ROOT) + "[0-9]*", faults::commands().back());
    EXPECT_NE(nullptr, make("cp"));
    check_sums(internal());
}

TEST_F(MediaStorageTest, VanishedSetAndLogRoot) {
    put(ROOT + "2016-02-01-00-00-00/cp/f", 7);
    init();
    for (int i = 0; i < 2; ++i) {
        ObjectRef<LogFile> file(make("cp"));
        file->write("12345", 5);
        const size_t before = open_descriptors();
        remove_tree(m_root.path(ROOT + (i == 0 ? TODAY : "")).c_str());
        faults::set_time(NOW + i);  // first within the same second
        CpSetDirectory* set = internal().prepare_cur_set();
        ASSERT_NE(nullptr, set);
        EXPECT_FALSE(file);
        EXPECT_EQ(before - 1, open_descriptors());
        EXPECT_EQ(set, internal().prepare_cur_set());
        EXPECT_EQ(i == 0 ? 7u : 0u, internal().size());
        EXPECT_EQ(i == 0 ? 2u : 1u, internal().sets().size());
        check_sums(internal());
    }
    // It cannot be made again.
    LogCapture log;
    remove_tree(m_root.path(ROOT).c_str());
    faults::fail(faults::MKDIR, 1, ENOSPC);
    EXPECT_EQ(nullptr, make("cp"));
    EXPECT_TRUE(
        log.has("CpSetDirectory* MediaStorage::prepare_cur_set(): create top dir error [28("));
    EXPECT_TRUE(internal().sets().empty());
    EXPECT_NE(nullptr, make("cp"));
    check_sums(internal());
}

TEST_F(MediaStorageTest, KestLayout) {
    m_mgr.set_kest_layout(true);
    m_root.write_file("card", "");
    LogCapture log;
    init(m_root.path("card").c_str());
    EXPECT_TRUE(
        log.has("int StorageManager::init(const android::String8&, LogController*, "
                "Multiplexer*): modem log in store manager in kest/modem_log!!!\n"));
    EXPECT_EQ(0775u, mode_of(m_root.path("data/kest")));
    EXPECT_EQ(0775u, mode_of(m_root.path("data/kest/modem_log")));
    remove_tree(m_root.path("data/kest").c_str());
    EXPECT_NE(nullptr, make("cp"));
    EXPECT_TRUE(m_root.exists("data/kest/modem_log/" + TODAY + "/cp"));
    EXPECT_EQ(nullptr, external().prepare_cur_set());
    EXPECT_TRUE(
        log.has("CpSetDirectory* MediaStorage::prepare_cur_set(): create parent dir error ["));
    EXPECT_EQ(-1, external().stat());
}

TEST_F(MediaStorageTest, ScanOfManySetsIsNotQuadratic) {
    const int num = 2000;
    for (int i = 0; i < num; ++i) {
        char name[64];
        snprintf(name, sizeof(name), "2016-02-01-%04d", (i * 1237) % num);
        m_root.write_file(ROOT + name + "/cp_wcn/0-cp_wcn-2016-03-01_10-00-00.log", "x");
    }
    const double walk = seconds([] {}, [&] { plain_walk(m_root.path(ROOT)); });
    const double scan = seconds([&] { internal().clear(); }, [&] { init(); });
    EXPECT_LT(scan, SCAN_FACTOR * walk);
    const Names names = set_names(internal());
    EXPECT_EQ(m_root.list(ROOT), names);
    EXPECT_EQ(static_cast<uint64_t>(num), internal().size());
}

}  // namespace
