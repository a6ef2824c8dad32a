// SPDX-License-Identifier: Apache-2.0
// The output of kestlog: text, or objects with --json. Names and contents come from a medium
// that anyone may have written to, so both are escaped.
#ifndef KESTLOG_REPORT_H_
#define KESTLOG_REPORT_H_

#include <functional>
#include <nlohmann/json_fwd.hpp>
#include <string>

#include "common/CommandLine.h"
#include "kestlog/FileScan.h"
#include "kestlog/LogReader.h"

// Keeps the order in which its members are set.
typedef nlohmann::ordered_json Json;

// Text from a medium as JSON can hold it: each byte is the code point of that number.
std::string json_text(const std::string& text);

// It in one line of ASCII, without a line feed; print_json prints it.
std::string json_line(const Json& json);
void print_json(const Json& json);

Json finding_json(const Finding& finding);

// "damage: words (at byte 12)".
std::string finding_text(const Finding& finding);

// Prints on standard error what failed; returns the status.
int failure(int status, const std::string& words);

// Opens the input file of a command. 0, or the exit status after printing the reason.
int open_input(LogReader& in, const std::string& path);

// Runs a command for each of the FILEs of the line; the largest of the statuses.
int for_each_file(const CommandLine& line,
                  const std::function<int(const CommandLine& line, const std::string& path)>& run);

// The size of all the files, or 0 when one is no file.
uint64_t total_size(const Args& paths);

// Prints the damage on standard error.
void tell_damage(const std::string& path, const FileReport& report);

// The exit status after the scan; prints a read error.
int scan_status(const LogReader& in, const std::string& path, const FileReport& report);

std::string file_part(const std::string& path);  // what follows the last "/"

#endif  // KESTLOG_REPORT_H_
