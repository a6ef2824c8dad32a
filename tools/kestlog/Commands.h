// SPDX-License-Identifier: Apache-2.0
// What the commands of kestlog do. Each prints everything and returns the exit status.
#ifndef KESTLOG_COMMANDS_H_
#define KESTLOG_COMMANDS_H_

#include <string>

// What the options say.
struct Settings {
    bool json;
    bool force;          // split: replace files
    std::string output;  // split: the directory that they go to
};

int run_ls(const std::string& path, const Settings& settings);
int run_info(const std::string& path, const Settings& settings);
int run_verify(const std::string& path, const Settings& settings);
int run_frames(const std::string& path, const Settings& settings);
int run_split(const std::string& path, const Settings& settings);

#endif  // KESTLOG_COMMANDS_H_
