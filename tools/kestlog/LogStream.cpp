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
        for (const StreamFile& log : stream.files) {
            if (m_directories.empty() || m_directories.back().cp != log.cp) {
                m_directories.push_back({log.cp, nullptr, nullptr, false});
            }
        }
    }
    std::sort(m_directories.begin(), m_directories.end(),
              [](const Directory& a, const Directory& b) { return a.cp < b.cp; });
    const auto same = [](const Directory& a, const Directory& b) { return a.cp == b.cp; };
    m_directories.erase(std::unique(m_directories.begin(), m_directories.end(), same),
                        m_directories.end());
    for (const LogStream& stream : streams) {
        for (const StreamFile& log : stream.files) {
            find(log.cp).last = log.file;
        }
        std::map<size_t, const StreamFile*> last_logs;  // of the handsets
        for (const StreamFile& log : stream.files) {
            const StreamFile*& last = last_logs[log.set->handset];
            Directory& own = find(log.cp);
            // By their times the files of two directories may be mixed. Sets are read in the
            // order of the tree.
            if (!own.begun && last && last->file->name.number == 0 && last->set < log.set) {
                Directory& other = find(last->cp);
                other.behind = last->file == other.last ? log.file : other.behind;
            }
            own.begun = true;
            last = &log;
        }
    }
}

NextLogs::Directory& NextLogs::find(const TreeCp* cp) {
    return *std::lower_bound(m_directories.begin(), m_directories.end(), cp, before);
}

const TreeFile* NextLogs::after(const TreeCp& cp, const TreeFile& log,
                                const TreeFile* newer) const {
    if (newer) {
        return log.name.number == newer->name.number + 1 ? newer : nullptr;
    }
    const auto found = std::lower_bound(m_directories.begin(), m_directories.end(), &cp, before);
    return found == m_directories.end() || found->cp != &cp ? nullptr : found->behind;
}
