// SPDX-License-Identifier: Apache-2.0
// The crashes in a tree: which memory dump, mini dump and records of the driver belong
// together.
#ifndef KESTLOG_CRASHES_H_
#define KESTLOG_CRASHES_H_

#include <string>
#include <vector>

#include "kestlog/DspDumps.h"
#include "kestlog/LogTree.h"

struct Crash {
    const TreeSet* set;
    const TreeCp* cp;
    LogTime time;                        // of its first file
    std::vector<const TreeFile*> files;  // by time
    // Of an audio DSP, whose dump is in its log files: words for it, and its bytes.
    std::string dump{};
    uint64_t dump_size = 0;
};

// Whether a crash left the file.
bool of_crash(const TreeFile& file);

// "memory dump, mini dump, IPC record (3)".
std::string crash_text(const Crash& crash);

// Adds what an audio DSP left in its log; false after the first 10,000.
bool add_crash(const DspDump& dump, std::vector<Crash>* crashes);

// The crashes of the audio DSP, whose logs are read for that. Prints nothing.
std::vector<Crash> find_dsp_crashes(const LogTree& tree);

// All crashes by time, those that are known already included, as far as names tell: a crash leaves
// its files in one CP's directory, none of a kind twice, and each within some minutes after the one
// before. The tree must stay as it is.
std::vector<Crash> find_crashes(const LogTree& tree, std::vector<Crash> known);

#endif  // KESTLOG_CRASHES_H_
