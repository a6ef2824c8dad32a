// SPDX-License-Identifier: Apache-2.0
// The short texts that the service keeps beside its logs.
#ifndef KESTLOG_SMALL_FILES_H_
#define KESTLOG_SMALL_FILES_H_

#include <stddef.h>

#include <string>

class LogReader;

// The first bytes of a file, at most so many; *error is an errno value, or 0.
std::string read_small(const std::string& path, size_t most, int* error);
// The next ones of a file that is open; they stay to be read.
std::string peek_small(LogReader& in, size_t most);

// A firmware version in its file, without a line feed; as the two above.
std::string read_version(const std::string& path, int* error);
std::string peek_version(LogReader& in);

// The version file of a CP in a directory, whose path ends with "/".
std::string version_path(const std::string& dir, const std::string& cp);

#endif  // KESTLOG_SMALL_FILES_H_
