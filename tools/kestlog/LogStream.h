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
// Of these the one that goes on where the i-th ends, or null.
const TreeFile* next_log(const std::vector<const TreeFile*>& logs, size_t i);

// The streams of all CPs that have log files, by name. The tree must stay as it is.
std::vector<LogStream> log_streams(const LogTree& tree);

#endif  // KESTLOG_LOGSTREAM_H_
