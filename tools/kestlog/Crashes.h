// SPDX-License-Identifier: Apache-2.0
// The crashes in a tree: which memory dump, mini dump and records of the driver belong
// together.
#ifndef KESTLOG_CRASHES_H_
#define KESTLOG_CRASHES_H_

#include <vector>

#include "kestlog/LogTree.h"

struct Crash {
    const TreeSet* set;
    const TreeCp* cp;
    LogTime time;                        // of its first file
    std::vector<const TreeFile*> files;  // by time
};

// Whether a crash left the file.
bool of_crash(const TreeFile& file);

// "memory dump, mini dump, IPC record (3)".
std::string crash_text(const Crash& crash);

// All crashes by time, as far as names tell: a crash leaves its files in one CP's directory,
// none of a kind twice, and each within some minutes after the one before. The tree must stay
// as it is.
std::vector<Crash> find_crashes(const LogTree& tree);

#endif  // KESTLOG_CRASHES_H_
