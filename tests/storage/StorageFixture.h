// SPDX-License-Identifier: Apache-2.0
// What the storage tests share: a root with the storage manager on it, a fixed clock in
// UTC, no file-creation mask (as the service runs), and a look at a medium's totals.
#ifndef TESTS_STORAGE_STORAGEFIXTURE_H_
#define TESTS_STORAGE_STORAGEFIXTURE_H_

#include <fcntl.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <time.h>

#include "storage/CpChannel.h"
#include "storage/CpDirectory.h"
#include "storage/CpSetDirectory.h"
#include "storage/CpStorage.h"
#include "storage/LogFile.h"
#include "storage/MediaStorage.h"
#include "storage/StorageManager.h"
#include "support/TestRoot.h"
#include "support/faults.h"

typedef std::vector<std::string> Names;

inline Names file_names(const CpDirectory& dir) {
    Names names;
    for (const LogFile* file : dir.files()) {
        names.push_back(file->name().string());
    }
    return names;
}

inline mode_t mode_of(const std::string& path) {
    struct stat st;
    return ::lstat(path.c_str(), &st) == 0 ? st.st_mode & 07777u : 0;
}

// A channel that has a name and nothing else.
class NamedChannel : public CpChannel {
public:
    explicit NamedChannel(const char* name) : CpChannel(-1, nullptr, nullptr), m_name(name) {}

    void process(int /*events*/) override {}
    const android::String8& name() const override { return m_name; }

private:
    const android::String8 m_name;
};

class StorageTest : public testing::Test {
protected:
    // 2016-03-01 09:15:00
    static constexpr time_t NOW = 1456823700;

    StorageTest() : m_umask(umask(0)) {
        setenv("TZ", "UTC", 1);
        tzset();
        faults::reset();
        faults::set_time(NOW);
        m_root.make_dir("sd");
    }
    ~StorageTest() override {
        faults::instead = {};
        faults::reset();
        umask(m_umask);
    }

    void init() { EXPECT_EQ(m_mgr.init(m_root.path("sd").c_str(), nullptr, nullptr), 0); }
    // The set of now and in it the directory of cp_wcn, with what is found there.
    void start() {
        init();
        bool new_dir = false;
        m_set = internal().create_cp_set();
        m_dir = m_set->prepare_cp_dir("cp_wcn", new_dir);
        ASSERT_NE(m_dir, nullptr);
    }
    void plug_card() { m_root.set_prop("init.svc.fuse_sdcard0", "running"); }
    void pull_card() { m_root.set_prop("init.svc.fuse_sdcard0", "stopped"); }
    MediaStorage& internal() { return *m_mgr.get_media(MT_INTERNAL); }
    MediaStorage& external() { return *m_mgr.get_media(MT_EXTERNAL); }
    // Looks at what lies on the internal medium as a start does.
    void rescan() {
        internal().clear();
        EXPECT_EQ(internal().stat(), 0);
    }

    // The store writes in the next second.
    int write_later(const std::string& data) {
        faults::set_time(++m_now);
        return m_store->write(data.data(), data.size());
    }

    // Every size is the sum of the sizes below.
    static void check_sums(const MediaStorage& media) {
        uint64_t sets = 0;
        for (const CpSetDirectory* set : media.sets()) {
            uint64_t dirs = 0;
            for (const CpDirectory* dir : set->dirs()) {
                uint64_t files = 0;
                for (const LogFile* file : dir->files()) {
                    files += file->counted();
                }
                EXPECT_EQ(dir->size(), files) << dir->path().string();
                dirs += dir->size();
            }
            EXPECT_EQ(set->size(), dirs) << set->path().string();
            sets += set->size();
        }
        EXPECT_EQ(media.size(), sets);
    }

    TestRoot m_root;
    StorageManager m_mgr;
    CpSetDirectory* m_set = nullptr;
    CpDirectory* m_dir = nullptr;
    NamedChannel m_channel{"cp_gnss"};
    CpStorage* m_store = nullptr;  // of that channel, in tests that make one
    time_t m_now = NOW;

private:
    mode_t m_umask;
};

#endif  // TESTS_STORAGE_STORAGEFIXTURE_H_
