// SPDX-License-Identifier: Apache-2.0

#include "kestlog/Crashes.h"

#include <algorithm>
#include <set>
#include <utility>

#include "kestlog/TreeInput.h"

namespace {

// A dump of a whole memory may take minutes before its substitute is begun.
constexpr int64_t MAX_PAUSE_SECONDS = 300;
// More than the service ever writes.
constexpr size_t MAX_FILES = 100;
// A log of nothing but one-byte dumps would take all memory.
constexpr size_t MAX_DSP_CRASHES = 10000;

// The name without its time: what a crash has only once.
std::string kind_key(const FileName& name) {
    std::string key = name.text();
    const std::string stamp = name.time().file_stamp().string();
    const size_t at = key.find(stamp);
    // What was set aside was there before: "-1" stays in the key.
    return at == std::string::npos ? key : key.erase(at, stamp.size());
}

void find_in(const TreeSet& set, const TreeCp& cp, std::vector<Crash>* crashes) {
    std::set<std::string> kinds;
    Crash crash = {&set, &cp, {}, {}, "", 0};
    const auto finish = [&]() {
        if (!crash.files.empty()) {
            crashes->push_back(crash);
        }
        crash.files.clear();
        kinds.clear();
    };
    for (const TreeFile& file : cp.files) {  // by time
        if (!of_crash(file)) {
            continue;
        }
        const LogTime& time = file.name.time();
        if (!crash.files.empty() &&
            (kinds.count(kind_key(file.name)) > 0 || crash.files.size() == MAX_FILES ||
             seconds_of(time) - seconds_of(crash.files.back()->name.time()) > MAX_PAUSE_SECONDS)) {
            finish();
        }
        crash.time = crash.files.empty() ? time : crash.time;
        crash.files.push_back(&file);
        kinds.insert(kind_key(file.name));
    }
    finish();
}

}  // namespace

bool of_crash(const TreeFile& file) {
    const LogType type = file.name.type;
    return type == LT_DUMP || type == LT_MINI_DUMP || type == LT_IPC_INFO;
}

namespace {

Crash crash_of(const DspDump& dump) {
    const StreamFile& first = dump.files[0];
    Crash crash = {first.set, first.cp, first.file->name.time(), {}, dump.words(), dump.bytes};
    for (const StreamFile& each : dump.files) {
        crash.files.push_back(each.file);
    }
    return crash;
}

}  // namespace

bool add_crash(const DspDump& dump, std::vector<Crash>* crashes) {
    if (crashes->size() >= MAX_DSP_CRASHES) {
        return false;
    }
    crashes->push_back(crash_of(dump));
    return true;
}

std::vector<Crash> find_dsp_crashes(const LogTree& tree) {
    std::vector<Crash> crashes;
    DspDumps dumps([&](const DspDump& dump) { add_crash(dump, &crashes); });
    for (const TreeSet& set : tree.sets) {
        for (const TreeCp& cp : set.cps) {
            for (const TreeFile* log : logs_in_order(cp)) {
                LogReader in;
                FileReport ignored;
                if (log->name.cp_type != CT_AGDSP || !in.open(log->path(), false)) {
                    continue;
                }
                dumps.enter({&set, &cp, log});
                const auto take = [&dumps](const Piece& chunk) {
                    dumps.take(chunk);
                    return true;
                };
                scan_file(in, log->name, take, FP_LENGTH, &ignored);
            }
        }
    }
    dumps.finish();
    return crashes;
}

std::string crash_text(const Crash& crash) {
    if (!crash.dump.empty()) {
        return crash.dump;
    }
    std::vector<std::pair<std::string, int>> kinds;
    for (const TreeFile* file : crash.files) {
        const auto found = std::find_if(kinds.begin(), kinds.end(), [file](const auto& kind) {
            return kind.first == file->name.kind();
        });
        if (found == kinds.end()) {
            kinds.push_back({file->name.kind(), 1});
        } else {
            ++found->second;
        }
    }
    std::string text;
    for (const auto& [kind, count] : kinds) {
        text += (text.empty() ? "" : ", ") + kind;
        text += count > 1 ? " (" + std::to_string(count) + ")" : "";
    }
    return text;
}

std::vector<Crash> find_crashes(const LogTree& tree, std::vector<Crash> known) {
    std::vector<Crash> crashes = std::move(known);
    for (const TreeSet& set : tree.sets) {
        for (const TreeCp& cp : set.cps) {
            find_in(set, cp, &crashes);
        }
    }
    std::stable_sort(crashes.begin(), crashes.end(),
                     [](const Crash& a, const Crash& b) { return a.time < b.time; });
    return crashes;
}
