// What the storage tests share: a root with the storage manager on it, a fixed clock in
// UTC, no file-creation mask (as the service runs), and a look at a medium's totals.
#ifndef TESTS_STORAGE_STORAGEFIXTURE_H_
#define TESTS_STORAGE_STORAGEFIXTURE_H_

#include <dirent.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include <chrono>
#include <string>
#include <vector>

#include "core/ObjectRef.h"
#include "storage/CpDirectory.h"
#include "storage/CpSetDirectory.h"
#include "storage/LogFile.h"
#include "storage/MediaStorage.h"
#include "storage/StorageManager.h"
#include "storage/faults.h"
#include "support/TestRoot.h"

typedef std::vector<std::string> Names;

inline Names file_names(const CpDirectory& dir) {
    Names names;
    for (const LogFile* file : dir.files()) {
        names.push_back(file->name().string());
    }
    return names;
}

// The last components of the sets' paths.
inline Names set_names(const MediaStorage& media) {
    Names names;
    for (const CpSetDirectory* set : media.sets()) {
        names.push_back(strrchr(set->path().string(), '/') + 1);
    }
    return names;
}

inline mode_t mode_of(const std::string& path) {
    struct stat st;
    return ::lstat(path.c_str(), &st) == 0 ? st.st_mode & 07777u : 0;
}

// Names that a shell, an option parser or a terminal could take for something else. All
// would make a file "pwned" or remove "canary" in the working directory if executed.
inline const Names& strange_names() {
    static const Names names = {"x; touch pwned",
                                "$(touch pwned)",
                                "`touch pwned`",
                                "a'b",
                                "a\"b",
                                "a'; touch pwned; '",
                                "line\ntouch pwned\n",
                                "-rf",
                                "--help",
                                "*",
                                "? [a-z]* ~ {a,b}",
                                "\\",
                                "a\\",
                                "&& rm -f canary",
                                "\xff\xfe\x80",
                                "#x",
                                "$HOME",
                                "~",
                                " ",
                                "\t",
                                "!!",
                                std::string(255, 'n'),
                                std::string(255, '\'')};
    return names;
}

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
        faults::reset();
        umask(m_umask);
    }

    void init(const char* sd_root = nullptr) {
        ASSERT_EQ(0, m_mgr.init(sd_root ? sd_root : m_root.path("sd").c_str(), nullptr, nullptr));
    }
    void plug_card() { m_root.set_prop("init.svc.fuse_sdcard0", "running"); }
    void pull_card() { m_root.set_prop("init.svc.fuse_sdcard0", "stopped"); }
    MediaStorage& internal() { return *m_mgr.get_media(MT_INTERNAL); }
    MediaStorage& external() { return *m_mgr.get_media(MT_EXTERNAL); }

    // Makes a file of a size that takes no space.
    void put(const std::string& rel, off_t size) {
        m_root.write_file(rel, "");
        ASSERT_EQ(0, truncate(m_root.path(rel).c_str(), size));
    }

    // Every directory's size is the sum of its files' sizes, a set's that of its
    // directories, the medium's that of its sets. extra: bytes known to be left in the
    // totals above, by a file or directory that vanished.
    static void check_sums(const MediaStorage& media, uint64_t set_extra = 0,
                           uint64_t media_extra = 0) {
        uint64_t sets = 0;
        for (const CpSetDirectory* set : media.sets()) {
            uint64_t dirs = 0;
            for (const CpDirectory* dir : set->dirs()) {
                uint64_t files = 0;
                for (const LogFile* file : dir->files()) {
                    files += file->size();
                }
                EXPECT_EQ(files, dir->size()) << dir->path().string();
                dirs += dir->size();
            }
            EXPECT_EQ(dirs + set_extra, set->size()) << set->path().string();
            sets += set->size();
        }
        EXPECT_EQ(sets + media_extra, media.size());
    }

    TestRoot m_root;
    StorageManager m_mgr;

private:
    mode_t m_umask;
};

// The least time of three runs, in seconds; prepare runs before each and does not count.
template <typename Prepare, typename Work>
double seconds(Prepare prepare, Work work) {
    double least = 1e9;
    for (int i = 0; i < 3; ++i) {
        prepare();
        const auto start = std::chrono::steady_clock::now();
        work();
        const std::chrono::duration<double> took = std::chrono::steady_clock::now() - start;
        least = took.count() < least ? took.count() : least;
    }
    return least;
}

// How much longer than the plain walk a scan may take: far more than it needs, far less
// than a quadratic one would.
#ifdef __SANITIZE_ADDRESS__
constexpr double SCAN_FACTOR = 40;
#else
constexpr double SCAN_FACTOR = 15;
#endif

// The plain walk that a scan cannot beat: every entry of the tree once through fstatat.
inline size_t plain_walk(const std::string& path) {
    size_t num = 0;
    DIR* dir = opendir(path.c_str());
    while (const struct dirent* entry = dir ? readdir(dir) : nullptr) {
        struct stat st;
        if (!strcmp(entry->d_name, ".") || !strcmp(entry->d_name, "..") ||
            fstatat(dirfd(dir), entry->d_name, &st, AT_SYMLINK_NOFOLLOW) < 0) {
            continue;
        }
        ++num;
        if (S_ISDIR(st.st_mode)) {
            num += plain_walk(path + "/" + entry->d_name);
        }
    }
    if (dir) {
        closedir(dir);
    }
    return num;
}

#endif  // TESTS_STORAGE_STORAGEFIXTURE_H_
