// SPDX-License-Identifier: Apache-2.0
// The part of CpDirectory that numbers the log files: the newest is 0, and each older one has
// a larger number than the next younger one.
#include <errno.h>
#include <stdint.h>
#include <sys/stat.h>

#include <algorithm>
#include <set>
#include <string_view>
#include <vector>

#include "core/log.h"
#include "storage/CpDirectory.h"
#include "storage/LogFile.h"
#include "storage/log_name.h"
#include "storage/paths.h"

namespace {

// Names that a renumbering finds taken: a broken medium may say so of every one.
constexpr int MAX_STRANGERS = 1000;

struct Numbered {
    LogFile* file;
    uint32_t number;
    size_t digits;
    uint64_t target;  // above UINT32_MAX: no number is left
};

}  // namespace

// True when something that is not listed has the name: a file in a set taken over, say.
bool CpDirectory::taken_by_stranger(const android::String8& name,
                                    const std::set<std::string_view>& listed) const {
    struct stat st;
    return listed.count(name.string()) == 0 && lstat(JoinedPath(m_path, name).string(), &st) == 0;
}

// Something else than a file has the place of a listed one: it is somebody else's.
bool CpDirectory::is_replaced(const LogFile* file) const {
    struct stat st;
    return lstat(JoinedPath(m_path, file->name()).string(), &st) == 0 && !S_ISREG(st.st_mode);
}

// Each file gets its number plus 1, but at least 1 more than the next younger file gets. So two
// files that share a number, because a renaming failed between them, get different ones.
void CpDirectory::rotate_logs() {
    std::vector<Numbered> logs;  // youngest first; of equal numbers the later in the list
    bool renumber = false;
    for (LogFile* file : m_files) {
        if (file->type() != LT_LOG) {
            continue;
        }
        Numbered log = {file, 0, 0, 0};
        if (parse_log_number(file->name(), log.number, log.digits) < 0) {
            log.number = UINT32_MAX;  // too large to be read: rotate() says so
        }
        renumber = renumber || log.number == 0;
        logs.push_back(log);
    }
    if (!renumber) {
        return;  // 0 is free: the last new file could not be made
    }
    if (leads_away()) {
        return;
    }
    std::set<std::string_view> listed;
    for (const LogFile* file : m_files) {
        listed.insert(file->name().string());
    }
    std::reverse(logs.begin(), logs.end());
    std::stable_sort(logs.begin(), logs.end(),
                     [](const Numbered& a, const Numbered& b) { return a.number < b.number; });
    uint64_t least = 0;
    int strangers = 0;
    for (Numbered& log : logs) {
        log.target = std::max(uint64_t{log.number} + 1, least);
        while (log.target <= UINT32_MAX && strangers < MAX_STRANGERS &&
               taken_by_stranger(
                   with_number(log.file->name(), static_cast<uint32_t>(log.target), log.digits),
                   listed)) {
            ++log.target;
            ++strangers;
        }
        least = log.target + 1;
    }
    // The oldest first: each one makes room for the next.
    for (size_t i = logs.size(); i-- > 0;) {
        const Numbered& log = logs[i];
        if (is_replaced(log.file)) {
            file_removed(log.file);
            continue;
        }
        errno = 0;  // not every failure sets it
        const bool next = log.target == uint64_t{log.number} + 1 || log.target > UINT32_MAX;
        const int result = next ? log.file->rotate(m_path)
                                : log.file->change_name_num(static_cast<uint32_t>(log.target));
        if (result < 0 && errno == ENOENT) {
            remove_file(log.file);  // somebody deleted it
        }
    }
}

// Keeps the numbers contiguous: the first log file gets the number after the oldest other one's.
void CpDirectory::renumber_first_log() {
    if (!m_first_log || leads_away() || is_replaced(m_first_log.get())) {
        return;
    }
    for (LogFile* file : m_files) {
        if (file->type() != LT_LOG || file == m_first_log.get()) {
            continue;
        }
        uint32_t number;
        size_t digits;
        if (parse_log_number(file->name(), number, digits) == 0 && number != UINT32_MAX) {
            m_first_log->change_name_num(number + 1);
        }
        return;
    }
}
