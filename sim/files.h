// SPDX-License-Identifier: Apache-2.0
// Whole files, and directories for a while.
#ifndef SIM_FILES_H_
#define SIM_FILES_H_

#include <string>

// What the file holds; "" when it cannot be read.
std::string read_text_file(const std::string& path);

// Where directories for a while are made: $TMPDIR or /tmp.
std::string temp_dir();
// Makes a directory "prefix.XXXXXX" below the parent. Its path; "" with errno set on failure.
std::string make_temp_dir(const std::string& parent, const std::string& prefix);
// Removes the directory with everything below it.
void remove_dir(const std::string& path);

#endif  // SIM_FILES_H_
