// SPDX-License-Identifier: Apache-2.0
// The table of kestlog follow: a row for each CP and one for all.
#ifndef KESTLOG_LIVE_TABLE_H_
#define KESTLOG_LIVE_TABLE_H_

#include <map>
#include <string>
#include <vector>

#include "kestlog/LiveTree.h"

// ms: the time in which the files have grown; at least 1.
std::vector<std::string> live_table(const std::map<std::string, LiveTree::Sum>& sums, int64_t ms);

#endif  // KESTLOG_LIVE_TABLE_H_
