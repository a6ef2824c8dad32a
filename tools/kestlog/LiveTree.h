// SPDX-License-Identifier: Apache-2.0
// What kestlog follow knows of the files in the log trees, and what it tells about their changes.
// The tree as it was read (take) and the changes that the kernel reports (created, moved, ...)
// may overlap in any way: nothing is told twice. Owns no descriptor and waits for nothing.
#ifndef KESTLOG_LIVETREE_H_
#define KESTLOG_LIVETREE_H_

#include <signal.h>
#include <stdint.h>

#include <functional>
#include <map>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "kestlog/DumpWatch.h"
#include "kestlog/FileScan.h"
#include "kestlog/LiveEvent.h"
#include "kestlog/LogTree.h"

class LiveTree {
public:
    // There may be very many: what its name says is read again when it is asked for.
    struct File {
        uint64_t size = 0;
        bool sized = true;              // the size is known
        bool unchecked = false;         // written to since it was last checked
        bool seen = false;              // while the tree is taken
        uint64_t checked = UINT64_MAX;  // its size when it was checked after it was closed
        uint64_t known = 0;             // an audio DSP's log: up to where its dumps are known
    };
    // A CP's directory. One that is gone is kept: a card that comes back is no news.
    struct Dir {
        std::string path, medium, set;
        std::string cp;  // the directory's own name
        bool present = false;
        std::map<std::string, File> files;  // by name
        uint64_t deleted = 0;               // files, not yet told
        uint64_t deleted_size = 0;
        std::string deleted_name;  // of the last of them
        size_t handset = 0;
    };
    // Of all files of a CP.
    struct Sum {
        uint64_t files = 0;
        uint64_t size = 0;
        uint64_t grown = 0;  // bytes since the last sums
        std::string newest;  // of the log files
    };

    // A check of a file's content ends early when *stop becomes other than 0.
    LiveTree(std::function<void(const LiveEvent&)> tell, const volatile sig_atomic_t* stop)
        : m_tell(std::move(tell)), m_stop(*stop) {}

    // The tree, and the log roots and ROOTs, as they are now. Tells what is new, but nothing the
    // first time; of a medium that appears with old sets only the sets, and the files of the
    // newest. The tree's files are given up on the way, as there may be very many.
    void take(LogTree& tree, const std::set<std::string>& roots);
    // What is known of all files: for the first line.
    LiveEvent ready() const;

    // The directory that was taken with this path, or null.
    Dir* dir(const std::string& path);
    // Changes of one file.
    void created(Dir& dir, const std::string& name);
    void moved(Dir& dir, const std::string& from, const std::string& to);
    void removed(Dir& dir, const std::string& name);
    void written(Dir& dir, const std::string& name);
    void closed(Dir& dir, const std::string& name);  // after it was written to
    void database_written(const std::string& root);

    // For when no more changes are known: tells dumps of an audio DSP, checks the files that were
    // closed and tells what was deleted.
    void settle();
    // At the end: checks what was written to and is still open.
    void check_open();
    // By CP. Looks at the sizes of the files that were written to.
    std::map<std::string, Sum> sums();

private:
    // That a file belongs to: in a renamed directory its own name tells.
    static std::string cp_of(const Dir& dir, const std::string& name);
    // What the service's counting up leaves as it is, by which log files are told apart.
    static std::string lasting_name(const FileName& name);
    static bool has_next_name(const Dir& dir, const FileName& name);
    typedef std::pair<Dir*, std::string> Place;  // a file's directory and name

    void take_roots(const std::set<std::string>& roots, bool tell);
    void leave(const std::set<std::string>& sets, const std::set<std::string>& dirs);
    void tell_set(const TreeSet& set);
    void take_files(Dir& dir, const std::vector<const TreeFile*>& files, bool tell);
    void add(Dir& dir, const std::string& name, const File& file, bool tell);
    static std::string counted_up(const Dir& dir);
    void tell_new(Dir& dir, const FileName& name);
    void tell_deleted(Dir& dir);
    void tell_dumps();
    bool read_dumps(Dir& dir, const FileName& name, bool tell);
    void tell(const char* event, const Dir& dir, const FileName& name, const std::string& words,
              const Json& more);
    void tell_crash(const Dir& dir, const FileName& name, const std::string& kind, uint64_t size,
                    bool complete);
    void tell_damage(const Dir& dir, const FileName& name, const Finding& finding);
    bool check(Dir& dir, const FileName& name, bool is_closed);
    void look(Dir& dir, const std::string& name);
    void forget(const Place& place);

    const std::function<void(const LiveEvent&)> m_tell;
    const volatile sig_atomic_t& m_stop;
    bool m_taken = false;
    std::set<std::string> m_roots;
    std::map<std::string, bool> m_sets;  // by path, and whether it is there
    std::map<std::string, Dir> m_dirs;
    std::map<size_t, DumpWatch> m_dumps;  // by handset
    std::set<Place> m_closed;             // to be checked
    std::set<Place> m_written;            // to be looked at
    std::set<Place> m_grown;              // to be looked into for dumps
    std::map<std::string, Sum> m_sums;
};

#endif  // KESTLOG_LIVETREE_H_
