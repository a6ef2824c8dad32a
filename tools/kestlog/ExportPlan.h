// SPDX-License-Identifier: Apache-2.0
// Which files of a tree have packets for a capture, in which order, and on which interface.
#ifndef KESTLOG_EXPORTPLAN_H_
#define KESTLOG_EXPORTPLAN_H_

#include <stdint.h>

#include <string>
#include <vector>

#include "kestlog/LogStream.h"

// A file with frames or chunks.
struct ExportSource {
    const TreeSet* set;
    const TreeCp* cp;
    const TreeFile* file;
    ShortTime order;                 // the sources are sorted by it
    uint32_t interface = 0;          // in ExportPlan::interfaces
    uint32_t queue = 0;              // on it: 0 is the log, and each other file has its own
    const TreeFile* next = nullptr;  // the log file that goes on where this one ends
};

// A CP in a set.
struct ExportInterface {
    std::string name;         // both are ASCII
    std::string description;  // set, medium and firmware
    uint32_t queues = 1;
};

// Points into the tree, which must stay as it is.
struct ExportPlan {
    // Of all CPs, or only of the one with that name.
    ExportPlan(const LogTree& tree, const std::string& cp);

    uint64_t size() const;  // bytes of the sources

    // Oldest first; the log files of a CP by number, whatever the clock said.
    std::vector<ExportSource> sources;
    std::vector<ExportInterface> interfaces;
    uint64_t left_out = 0;  // files that hold no frames

private:
    void find_sources(const LogTree& tree, const std::vector<LogStream>& streams,
                      const std::string& cp);
    void find_interfaces(const NextLogs& next);
};

#endif  // KESTLOG_EXPORTPLAN_H_
