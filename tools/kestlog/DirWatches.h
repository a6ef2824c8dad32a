// SPDX-License-Identifier: Apache-2.0
// The directories whose changes the kernel reports to kestlog follow. They are set anew each
// time the tree is read; what is not set again is let go of.
#ifndef KESTLOG_DIRWATCHES_H_
#define KESTLOG_DIRWATCHES_H_

#include <sys/inotify.h>

#include <functional>
#include <map>
#include <set>
#include <string>

class DirWatches {
public:
    enum Kind {
        PLACE,  // where only directories of certain names count
        LOGS,   // a log root or a set: every directory in it counts
        FILES,  // a CP's directory
        WRITES  // one of which every write to a file is reported, too
    };
    struct Watch {
        std::string path;
        Kind kind = PLACE;
        std::set<std::string> names;  // also to look for in it
        unsigned round = 0;
    };
    enum Result { KNOWN, ADDED, FAILED };

    DirWatches() = default;
    ~DirWatches();
    DirWatches(const DirWatches&) = delete;
    DirWatches& operator=(const DirWatches&) = delete;

    // False, with errno, on failure.
    bool open();
    int fd() const { return m_fd; }

    void begin();
    // FAILED, with errno, when the directory cannot be watched. A directory may be given several
    // times, with a further name to look for. One that has another path than before is ADDED.
    Result add(const std::string& path, Kind kind, const std::string& name = "");
    void end();

    // Takes the changes that have come, without waiting; watch is null when it is none of a
    // watched directory: the kernel has lost changes, or a directory is gone.
    void read(const std::function<void(const inotify_event& event, const Watch* watch)>& visit);

private:
    int m_fd = -1;
    unsigned m_round = 0;
    std::map<int, Watch> m_watches;
};

#endif  // KESTLOG_DIRWATCHES_H_
