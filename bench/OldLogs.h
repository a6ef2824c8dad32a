// SPDX-License-Identifier: Apache-2.0
// A directory full of log files such as the service leaves behind, sparse so that they take no
// room. Makes them at once; they stay.
#ifndef BENCH_OLDLOGS_H_
#define BENCH_OLDLOGS_H_

#include <stdint.h>

#include <string>
#include <vector>

class OldLogs {
public:
    // The files of one co-processor in one set of the log root, each of so many bytes.
    OldLogs(const std::string& log_root, const std::string& set, const std::string& cp,
            unsigned files, uint64_t size);

    bool made() const { return m_made; }
    const std::string& set_dir() const { return m_set_dir; }
    unsigned files() const { return m_files; }
    // The file, 0 for the oldest, whose number is one less for each younger one; with another
    // number when it has been renamed since.
    std::string path(unsigned index, unsigned added = 0) const;
    // Of all files, the oldest first.
    std::vector<std::string> paths(unsigned added = 0) const;

private:
    const std::string m_set_dir;
    const std::string m_cp;
    const unsigned m_files;
    bool m_made = false;
};

#endif  // BENCH_OLDLOGS_H_
