// SPDX-License-Identifier: Apache-2.0

#include "kestlog/LogStream.h"

#include <algorithm>
#include <map>
#include <set>

namespace {

struct Place {
    ShortTime time;  // never earlier than that of an older file in the same directory
    StreamFile file;
};

void add_directory(const TreeSet& set, const TreeCp& cp, std::vector<Place>* places) {
    LogTime time;
    for (const TreeFile* log : logs_in_order(cp)) {
        time = std::max(time, log->name.time());
        places->push_back({ShortTime(time), {&set, &cp, log}});
    }
}

}  // namespace

std::vector<const TreeFile*> logs_in_order(const TreeCp& cp) {
    std::vector<const TreeFile*> logs;
    for (const TreeFile& file : cp.files) {
        if (file.name.is_log()) {
            logs.push_back(&file);
        }
    }
    std::stable_sort(logs.begin(), logs.end(), [](const TreeFile* a, const TreeFile* b) {
        return a->name.number > b->name.number;
    });
    return logs;
}

std::vector<LogStream> log_streams(const LogTree& tree) {
    std::map<std::string, std::vector<Place>> cps;
    for (const TreeSet& set : tree.sets) {
        for (const TreeCp& cp : set.cps) {
            add_directory(set, cp, &cps[cp.name]);
        }
    }
    std::vector<LogStream> streams;
    for (auto& [cp, places] : cps) {
        if (places.empty()) {
            continue;
        }
        std::stable_sort(places.begin(), places.end(), [](const Place& a, const Place& b) {
            return a.time.time() < b.time.time();
        });
        streams.push_back({cp, {}});
        streams.back().files.reserve(places.size());
        for (const Place& place : places) {
            streams.back().files.push_back(place.file);
        }
        places = std::vector<Place>();  // there may be very many
    }
    return streams;
}

NextLogs::NextLogs(const std::vector<LogStream>& streams) {
    for (const LogStream& stream : streams) {
        std::map<const TreeCp*, const TreeFile*> ends;
        for (const StreamFile& log : stream.files) {
            ends[log.cp] = log.file;
        }
        std::map<size_t, const StreamFile*> last_logs;  // of the handsets
        std::set<const TreeCp*> begun;
        for (const StreamFile& log : stream.files) {
            const StreamFile*& last = last_logs[log.set->handset];
            // By their times the files of two directories may be mixed. Sets are read in the
            // order of the tree.
            if (begun.insert(log.cp).second && last && last->file == ends[last->cp] &&
                last->file->name.number == 0 && last->set < log.set) {
                m_behind[last->cp] = log.file;
            }
            last = &log;
        }
    }
}

const TreeFile* NextLogs::after(const TreeCp& cp, const TreeFile& log,
                                const TreeFile* newer) const {
    if (newer) {
        return log.name.number == newer->name.number + 1 ? newer : nullptr;
    }
    const auto found = m_behind.find(&cp);
    return found == m_behind.end() ? nullptr : found->second;
}
