// SPDX-License-Identifier: Apache-2.0

#include "kestlog/LogStream.h"

#include <algorithm>
#include <map>

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

const TreeFile* next_log(const std::vector<const TreeFile*>& logs, size_t i) {
    const bool goes_on =
        i + 1 < logs.size() && logs[i]->name.number == logs[i + 1]->name.number + 1;
    return goes_on ? logs[i + 1] : nullptr;
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
