// SPDX-License-Identifier: Apache-2.0
// The part of CpDirectory that finds out what is on the medium.
#include <errno.h>
#include <string.h>
#include <sys/stat.h>

#include <algorithm>
#include <vector>

#include "storage/CpDirectory.h"
#include "storage/CpSetDirectory.h"
#include "storage/LogFile.h"
#include "storage/dir_entries.h"
#include "storage/log_name.h"
#include "storage/paths.h"

int CpDirectory::stat() {
    std::vector<LogFile*> found;
    const int result = for_each_entry(m_path, [&](const char* name, const struct stat& st) {
        if (!S_ISREG(st.st_mode)) {
            return;
        }
        LogFile* file = new LogFile(android::String8(name), this, LT_UNKNOWN, 0);
        file->parse_name();
        file->found(static_cast<uint64_t>(st.st_size));
        found.push_back(file);
        m_size += file->counted();
    });
    insert_scanned(found.data(), found.size());
    m_left_out = result != 0;
    return result < 0 ? -1 : 0;
}

bool CpDirectory::found_empty() {
    if (m_files.empty() && m_left_out && m_asked++ % ASKED_PER_SCAN == 0 && !is_link(m_path)) {
        stat();
        m_set->add_size(m_size);
    }
    return m_files.empty() && !m_left_out;
}

size_t CpDirectory::recount() {
    size_t looked_at = 0;
    m_size = 0;
    FileIter it = m_files.begin();
    while (it != m_files.end()) {
        LogFile* file = *it;
        struct stat st;
        ++looked_at;
        const bool known = lstat(JoinedPath(m_path, file->name()).string(), &st) == 0;
        if (known ? !S_ISREG(st.st_mode) : means_vanished(errno)) {
            it = drop(it);
            continue;
        }
        file->forget_stuck();             // it is time for another try
        if (known && !file->is_open()) {  // part of an open file may still be staged
            file->found(static_cast<uint64_t>(st.st_size));
        }
        m_size += file->counted();
        ++it;
    }
    return looked_at;
}

// Puts a scan's files into the list order. They are sorted first, so that a directory
// of many thousand files costs n log n comparisons instead of n walks along the list.
void CpDirectory::insert_scanned(LogFile** files, size_t num) {
    // Where a kind stands: unknown files lead, version records end the list.
    auto group = [](const LogFile* file) {
        return file->type() == LT_UNKNOWN ? 0 : file->type() == LT_VERSION ? 2 : 1;
    };
    // Of log files made within one second the one with the larger number is older. Other
    // files count as number 0, so that the order stays a strict one among mixed kinds.
    auto number = [](const LogFile* file) {
        uint32_t value = 0;
        size_t digits;
        return file->type() == LT_LOG && parse_log_number(file->name(), value, digits) == 0 ? value
                                                                                            : 0;
    };
    std::stable_sort(files, files + num, [&](const LogFile* a, const LogFile* b) {
        if (group(a) != group(b)) {
            return group(a) < group(b);
        }
        if (group(a) != 1) {
            return false;
        }
        if (a->time() < b->time() || b->time() < a->time()) {
            return a->time() < b->time();
        }
        if (number(a) != number(b)) {
            return number(a) > number(b);
        }
        // Of two log files with one number the older was set aside: "-1" stands in front of
        // its ".log".
        const bool logs = a->type() == LT_LOG && b->type() == LT_LOG;
        return logs ? strcmp(a->name().string(), b->name().string()) < 0
                    : a->type() != LT_LOG && b->type() == LT_LOG;
    });
    // Unknown files each go ahead of those found before.
    std::reverse(files, std::find_if(files, files + num,
                                     [&](const LogFile* file) { return group(file) != 0; }));
    for (size_t i = 0; i < num; ++i) {
        m_files.push_back(files[i]);
    }
}
