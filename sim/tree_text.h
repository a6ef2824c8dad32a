// SPDX-License-Identifier: Apache-2.0
// The log trees of a handset as text that is the same whenever the same was logged: times in
// the names become SET1, SET2 ... (sets, oldest first) and TIME (files).
#ifndef SIM_TREE_TEXT_H_
#define SIM_TREE_TEXT_H_

#include <string>

// All files and empty directories of a log root (a directory relative to the handset's root),
// in the order of their names, and the files' bytes as show_bytes() shows them. "" when there
// is no such directory.
std::string show_log_root(const std::string& handset_root, const std::string& log_root);

#endif  // SIM_TREE_TEXT_H_
