// SPDX-License-Identifier: Apache-2.0
// What a CP's log becomes as one stream: which of its files belong in it, which are copies of
// others, and what is missing between them.
#ifndef KESTLOG_STREAMPLAN_H_
#define KESTLOG_STREAMPLAN_H_

#include <string>
#include <vector>

#include "common/CommandLine.h"
#include "kestlog/FileScan.h"
#include "kestlog/LogStream.h"

struct PlannedFile {
    const TreeFile* file;
    bool left_out = false;
    bool last = false;              // the newest of the stream
    std::vector<Finding> findings;  // about its place in the stream
};

// In the order of the stream. Trimmed oldest files are no gap, numbers that are missing before a
// newer file are. A file that is there twice, because a set was copied, is read to find out
// whether one copy is the beginning of the other; the shorter one is then left out. So is what
// holds the same as a namesake that it was set aside for.
std::vector<PlannedFile> plan_stream(const LogStream& stream);

// The stream that --cp names, or the only one. Null when there is none, after printing why, with
// the exit status in *status.
const LogStream* choose_stream(const CommandLine& line, const std::vector<LogStream>& streams,
                               int* status);

#endif  // KESTLOG_STREAMPLAN_H_
