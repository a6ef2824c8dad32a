// SPDX-License-Identifier: Apache-2.0
// Unpacks a tar (compressed or not) or zip of logs from anyone. Nothing is written outside the
// given directory, nothing is executable, and it takes no more room than it may.
#ifndef KESTLOG_ARCHIVE_H_
#define KESTLOG_ARCHIVE_H_

#include <stdint.h>

#include <string>
#include <vector>

struct Unpacked {
    bool is_archive = false;
    // A line for each entry that was left out or is damaged: the first MAX_LINES.
    std::vector<std::string> failures;
    // Names of links and devices, which are left out: the first MAX_STRAYS.
    std::vector<std::string> strays;

    static constexpr size_t MAX_LINES = 20;
    static constexpr size_t MAX_STRAYS = 1000;
};

// Whether it is such a file, by its beginning. A file of the service is none, and what is no file
// could wait for ever; of standard input ("-"), which must have an end, the beginning is used up.
bool is_archive(const std::string& path);

// Unpacks the file at path, or standard input for "-", into an existing empty directory. limit:
// the most bytes of all files, where a directory counts as 4 KiB, or 0 for what is free there less
// a tenth.
Unpacked unpack_archive(const std::string& path, const std::string& dir, uint64_t limit);

#endif  // KESTLOG_ARCHIVE_H_
