// SPDX-License-Identifier: Apache-2.0
// The directories of log trees: log roots contain sets, sets contain CP directories, and
// those contain files. Any number of ROOTs is read into one tree. Links are listed as strays
// and never followed.
#ifndef KESTLOG_LOGTREE_H_
#define KESTLOG_LOGTREE_H_

#include <stdint.h>
#include <sys/types.h>
#include <time.h>

#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "core/open_file.h"
#include "kestlog/FileName.h"
#include "kestlog/TempDir.h"

// Where a handset's root has its card: the mount point that the simulated handset uses, too.
constexpr char CARD_IN_ROOT[] = "/storage/sdcard0";
// What the media of a handset are called.
constexpr char MEDIUM_INTERNAL[] = "internal";
constexpr char MEDIUM_CARD[] = "card";

// A directory below which the tree has others. Both paths end with "/".
struct TreeTop {
    std::string path;    // where to open the files
    std::string shown;   // the same for humans: a path in an archive begins with its name
    std::string medium;  // for humans: "internal", "card" or what the ROOT is called
};

// A directory of the tree. As there may be very many, what they have in common stands once.
struct TreeDir {
    const TreeTop* top;  // the tree's
    std::string below;   // "", or the way from there, with "/" at its end

    std::string path() const { return top->path + below; }
    std::string shown() const { return top->shown + below; }
    std::string name() const;  // shown, without "/" at its end
    const std::string& medium() const { return top->medium; }
};

// There may be several hundred thousand.
struct TreeFile {
    FileName name;
    const TreeDir* dir;  // the tree's
    uint64_t size;
    time_t modified;
    // Of a log file: the time of the next newer one or, of the newest, when it was written to
    // last if the CP has its own times. Of any other the time in its name.
    ShortTime end{};
    // Of a log file: the numbers between it and the next newer one (down to 0 from the newest)
    // that are missing.
    uint32_t missing = 0;
    bool doubled = false;     // a log file beside it has the same number
    bool set_aside = false;   // but one of the two was set aside, as it is allowed to be
    bool disordered = false;  // by its number it is older than a log file with an earlier time

    uint32_t first_missing() const { return name.number - missing; }
    std::string path() const { return dir->path() + name.text(); }
    std::string shown() const { return dir->shown() + name.text(); }
};
static_assert(sizeof(TreeFile) <= 96, "a tree of 100,000 files stays small");

struct TreeCp {
    std::string name;
    const TreeDir* dir;           // the tree's
    std::vector<TreeFile> files;  // by time, oldest first
    bool own_times = true;        // the last writes are the handset's, not those of a copy
};

struct TreeSet {
    std::string name;    // "" when only a CP directory or a file was given
    const TreeDir* dir;  // the tree's
    LogTime time;        // of its name or, without one, of its first file
    std::vector<TreeCp> cps;
    size_t handset = 0;  // each ROOT is taken for another one
    bool given = false;  // by the paths of its files, which may be links or pipes

    std::string shown() const;  // its path for humans
    const std::string& medium() const { return dir->medium(); }
};

// A time of the file system, in this machine's zone.
LogTime local_time(time_t seconds);

// "numbers 3 to 5 are missing".
std::string missing_text(const TreeFile& log);

class LogTree {
public:
    enum Files { DIRECTORIES_ONLY, FILES_TOO };

    // Adds what is at path: a handset's root, a medium's top directory, a log root, a set or a
    // CP directory, or an archive of one of them ("-": on standard input), which is unpacked;
    // with FILES_TOO also a single file of any name, or standard input. False when it is not one of
    // them or not there. What cannot be read goes to failures. Nothing is added twice.
    bool add(const std::string& path, Files files = DIRECTORIES_ONLY);
    // Adds a single file of any name; it need not be there. Those of one CP in one directory are a
    // set, in which only what lies between two of them is missing; any other file is one of its
    // own.
    void add_file(const std::string& path);
    // Adds what is a ROOT as the card, before any other. With it a handset's root does not take
    // the card that it has itself. False also when it is not there.
    bool add_card(const std::string& path);
    // The most bytes that each archive may take; 0 for what is free.
    void limit_archives(uint64_t bytes) { m_unpack_limit = bytes; }
    // Sorts the sets and finds the ends and the missing numbers of all log files. Called once,
    // when everything has been added.
    void finish();
    // Leaves out the files that ended before since or began after until. A time that is not set
    // does not count; nor does a file without a time. CPs that lose all but their version go, too,
    // and sets without a CP.
    void cut(const LogTime& since, const LogTime& until);
    // The newest time in the tree: of a name or of the end of a log file.
    LogTime newest() const;
    // The bytes of all files.
    uint64_t size() const;

    std::vector<TreeFile> root_files;  // in the log roots themselves
    std::vector<TreeSet> sets;         // oldest first
    std::vector<std::string> strays;   // paths for humans of what does not belong there
    std::vector<std::string> foreign;  // the same of what a PC left there
    std::vector<std::string> failures;

private:
    struct Entry {
        std::string name;
        bool dir;
        bool file;
        uint64_t size;
        time_t modified;
    };

    // Calls visit for what is in a directory, in no order, and puts foreign entries aside. False,
    // with an entry in failures, when it cannot be read.
    bool visit_dir(const std::string& path, const std::function<void(const Entry&)>& visit);
    // The same by name.
    std::vector<Entry> list_dir(const std::string& path);
    const TreeDir* top_dir(const std::string& path, const std::string& shown);
    const TreeDir* dir_below(const TreeDir& dir, const std::string& name);
    std::string shown(const std::string& path) const;
    bool first_visit(const std::string& path);
    bool add_as(const std::string& medium, const std::string& given, Files files);
    bool add_archive(const std::string& path);
    bool add_media(const std::string& path);
    bool add_medium(const std::string& path, const std::string& name, Links links = Links::REFUSE);
    bool add_directory(const std::string& path);
    void read_root(const std::string& path);
    void read_set(const TreeDir& dir, const std::string& name);
    // The directory of a CP or, under another name, of files that may be from several CPs.
    void read_cp(const TreeDir& dir, const std::string& name, TreeSet* set);

    std::string m_medium;                         // of what is being added
    std::pair<std::string, std::string> m_alias;  // the prefix of paths, and what is shown for it
    std::set<std::pair<dev_t, ino_t>> m_visited;
    std::map<std::pair<std::string, std::string>, size_t> m_given;  // sets, by directory and CP
    bool m_card_given = false;
    size_t m_roots = 0;
    size_t m_archives = 0;
    std::deque<TreeTop> m_tops;  // which stay where they are
    std::deque<TreeDir> m_dirs;  // likewise
    uint64_t m_unpack_limit = 0;
    std::unique_ptr<TempDir> m_unpacked;  // with a directory for each archive
};

#endif  // KESTLOG_LOGTREE_H_
