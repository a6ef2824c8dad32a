// SPDX-License-Identifier: Apache-2.0
// What the commands that take ROOTs have in common: their parameters and the options --card,
// --since and --until.
#ifndef KESTLOG_TREEINPUT_H_
#define KESTLOG_TREEINPUT_H_

#include "common/CommandLine.h"
#include "kestlog/LogTree.h"

// Reads the ROOTs, or those that are given as roots, into the tree. False, after printing why,
// when the command must end with *status; with FILES_TOO a ROOT may be a file, too. What could
// not be read of the ROOTs stands in tree->failures.
bool open_tree(const CommandLine& line, LogTree* tree, int* status,
               LogTree::Files files = LogTree::DIRECTORIES_ONLY);
bool open_tree(const CommandLine& line, const Args& roots, LogTree* tree, int* status,
               LogTree::Files files = LogTree::DIRECTORIES_ONLY);

// The FILEs of the line that --since and --until leave, in the same order; "-" always stays.
// False, after printing why, when the command must end with *status.
bool select_files(const CommandLine& line, Args* files, int* status);

// Prints the failures of the tree; ES_OK without one, else ES_UNREADABLE.
int tell_failures(const LogTree& tree);

// T of --since and --until: "2016-03-01 09:15:00", also with a "T" or as it stands in the names
// of files and sets, "2016-03-01" (whose end counts when end is set), "09:15" on the day of newest,
// or "-10m", "-2h" before newest. False when it is none.
bool parse_time(const std::string& text, const LogTime& newest, bool end, LogTime* time);

// For differences: the seconds from 1970 on in the time's own zone.
int64_t seconds_of(const LogTime& time);
LogTime time_of(int64_t seconds);

#endif  // KESTLOG_TREEINPUT_H_
