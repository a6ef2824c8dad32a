// SPDX-License-Identifier: Apache-2.0
// The log of one CP, over all sets and media of a tree: its log files, oldest first. What is
// missing between them stands in each TreeFile.
#ifndef KESTLOG_LOGSTREAM_H_
#define KESTLOG_LOGSTREAM_H_

#include <string>
#include <vector>

#include "kestlog/LogTree.h"

struct StreamFile {
    const TreeSet* set;
    const TreeCp* cp;
    const TreeFile* file;
};

struct LogStream {
    std::string cp;  // its directory's name
    // In a directory by number, whatever the clock said; directories are merged by time.
    std::vector<StreamFile> files;
};

// The log files of a directory by number, oldest first, whatever the clock said.
std::vector<const TreeFile*> logs_in_order(const TreeCp& cp);

// The streams of all CPs that have log files, by name. The tree must stay as it is.
std::vector<LogStream> log_streams(const LogTree& tree);

// Which log file may go on where another one ends: that of the next number or, behind the last of
// a set, the oldest in the next set of the same handset that has logs of the CP, on any medium.
// Between two handsets nothing goes on. The tree must stay as it is.
class NextLogs {
public:
    // Of the tree's streams, which are needed no longer then.
    explicit NextLogs(const std::vector<LogStream>& streams);

    // newer: the log file behind it in its directory, or null. The result may be null, too.
    const TreeFile* after(const TreeCp& cp, const TreeFile& log, const TreeFile* newer) const;
    // The same of the i-th of logs_in_order(cp).
    const TreeFile* after(const TreeCp& cp, const std::vector<const TreeFile*>& logs,
                          size_t i) const {
        return after(cp, *logs[i], i + 1 < logs.size() ? logs[i + 1] : nullptr);
    }

private:
    struct Directory {
        const TreeCp* cp;
        const TreeFile* last;    // log file in it
        const TreeFile* behind;  // that one, or null
        bool begun;
    };

    static bool before(const Directory& directory, const TreeCp* cp) { return directory.cp < cp; }
    Directory& find(const TreeCp* cp);

    std::vector<Directory> m_directories;  // by cp: small, as there may be very many
};

#endif  // KESTLOG_LOGSTREAM_H_
