// SPDX-License-Identifier: Apache-2.0
// The order, ends and missing numbers of the files in a tree, once it has been read.
#include <algorithm>
#include <map>

#include "kestlog/LogTree.h"

namespace {

bool older(const TreeFile& a, const TreeFile& b) {
    const LogTime times[] = {a.name.time(), b.name.time()};
    if (times[0] < times[1] || times[1] < times[0]) {
        return times[0] < times[1];
    }
    return a.name.number != b.name.number ? a.name.number > b.name.number
                                          : a.name.text() < b.name.text();
}

// The newest log file has number 0, and each older one the next number.
void find_missing(std::vector<TreeFile>* files, bool given) {
    std::vector<TreeFile*> logs;
    for (TreeFile& file : *files) {
        file.end = ShortTime(file.name.time());
        if (file.name.is_log()) {
            logs.push_back(&file);
        }
    }
    // From the newest to the oldest, also of those with one number.
    std::reverse(logs.begin(), logs.end());
    std::stable_sort(logs.begin(), logs.end(), [](const TreeFile* a, const TreeFile* b) {
        return a->name.number < b->name.number;
    });
    uint32_t due = given && !logs.empty() ? logs[0]->name.number : 0;
    const TreeFile* newer = nullptr;
    for (TreeFile* log : logs) {
        const uint32_t number = log->name.number;
        if (newer && newer->name.number == number) {
            // A file that was set aside keeps its number until the next renumbering.
            log->doubled = true;
            log->set_aside = log->name.aside() || newer->name.aside();
        } else {
            // Trimming may delete the file that has just been closed.
            log->missing = number - due;
        }
        log->disordered =
            newer && newer->name.number < number && newer->name.time() < log->name.time();
        log->end =
            ShortTime(newer ? std::max(log->name.time(), newer->name.time()) : log->name.time());
        due = number + 1;
        newer = log;
    }
}

// The log file of the CP that was begun last; null without one.
TreeFile* newest_log(TreeCp* cp) {
    TreeFile* newest = nullptr;
    for (TreeFile& file : cp->files) {
        if (file.name.is_log() && (!newest || file.name.number <= newest->name.number)) {
            newest = &file;
        }
    }
    return newest;
}

// Whether the last writes to the log files fit their names: -1 when one does not, as in a copy
// or where this machine has another zone; 0 when nothing tells.
int times_fit(const TreeCp& cp, const TreeFile* newest) {
    constexpr time_t TOLERANCE = 60;
    int fit = 0;
    for (const TreeFile& file : cp.files) {
        if (!file.name.is_log()) {
            continue;
        }
        if (local_time(file.modified + TOLERANCE) < file.name.time() ||
            (&file != newest && file.end.time() < local_time(file.modified - TOLERANCE))) {
            return -1;
        }
        fit = &file == newest ? fit : 1;
    }
    return fit;
}

// Gives the newest log files the end that their last write tells, where it can be believed.
void find_ends(std::vector<TreeSet>* sets) {
    // Where a CP's files tell nothing, those of the other CPs on its medium do.
    std::map<std::pair<size_t, std::string>, int> media;
    std::vector<int> fits;
    for (TreeSet& set : *sets) {
        for (TreeCp& cp : set.cps) {
            fits.push_back(times_fit(cp, newest_log(&cp)));
            media[{set.handset, set.medium()}] += fits.back();
        }
    }
    auto fit = fits.begin();
    for (TreeSet& set : *sets) {
        for (TreeCp& cp : set.cps) {
            TreeFile* const newest = newest_log(&cp);
            cp.own_times = (*fit ? *fit : media[{set.handset, set.medium()}]) >= 0;
            ++fit;
            if (newest && cp.own_times) {
                newest->end =
                    ShortTime(std::max(newest->name.time(), local_time(newest->modified)));
            }
        }
    }
}

}  // namespace

LogTime local_time(time_t seconds) {
    struct tm t;
    return localtime_r(&seconds, &t) ? LogTime::from_tm(t) : LogTime();
}

std::string missing_text(const TreeFile& log) {
    const std::string first = std::to_string(log.first_missing());
    return log.missing == 1
               ? "number " + first + " is missing"
               : "numbers " + first + " to " + std::to_string(log.name.number - 1) + " are missing";
}

void LogTree::finish() {
    for (TreeSet& set : sets) {
        LogTime first;
        for (TreeCp& cp : set.cps) {
            std::sort(cp.files.begin(), cp.files.end(), older);
            find_missing(&cp.files, set.given);
            for (const TreeFile& file : cp.files) {
                if (has_time(file.name.time())) {
                    first = has_time(first) ? std::min(first, file.name.time()) : file.name.time();
                }
            }
        }
        set.time = has_time(set.time) ? set.time : first;
    }
    find_ends(&sets);
    std::stable_sort(sets.begin(), sets.end(),
                     [](const TreeSet& a, const TreeSet& b) { return a.time < b.time; });
}

void LogTree::cut(const LogTime& since, const LogTime& until) {
    if (!has_time(since) && !has_time(until)) {
        return;
    }
    const auto outside = [&](const TreeFile& file) {
        return has_time(file.name.time()) && ((has_time(since) && file.end.time() < since) ||
                                              (has_time(until) && until < file.name.time()));
    };
    const auto is_version = [](const TreeFile& file) { return file.name.type == LT_VERSION; };
    for (TreeSet& set : sets) {
        for (auto cp = set.cps.begin(); cp != set.cps.end();) {
            std::vector<TreeFile>& files = cp->files;
            const auto end = std::remove_if(files.begin(), files.end(), outside);
            const bool less = end != files.end();
            files.erase(end, files.end());
            const bool lost = less && std::all_of(files.begin(), files.end(), is_version);
            cp = lost ? set.cps.erase(cp) : cp + 1;
        }
    }
    sets.erase(std::remove_if(sets.begin(), sets.end(),
                              [](const TreeSet& set) { return set.cps.empty(); }),
               sets.end());
}

LogTime LogTree::newest() const {
    LogTime last;
    for (const TreeSet& set : sets) {
        last = std::max(last, set.time);
        for (const TreeCp& cp : set.cps) {
            for (const TreeFile& file : cp.files) {
                last = std::max(last, file.end.time());
            }
        }
    }
    return last;
}

uint64_t LogTree::size() const {
    uint64_t bytes = 0;
    for (const TreeFile& file : root_files) {
        bytes += file.size;
    }
    for (const TreeSet& set : sets) {
        for (const TreeCp& cp : set.cps) {
            for (const TreeFile& file : cp.files) {
                bytes += file.size;
            }
        }
    }
    return bytes;
}
