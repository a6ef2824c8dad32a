// SPDX-License-Identifier: Apache-2.0

#include "kestlog/StreamPlan.h"

#include <string.h>
#include <strings.h>

#include <algorithm>
#include <map>
#include <set>

#include "kestlog/ExitStatus.h"
#include "kestlog/LogReader.h"
#include "kestlog/Report.h"

namespace {

// Whether the shorter of two files is the beginning of the longer one.
bool same_beginning(const TreeFile& a, const TreeFile& b) {
    LogReader readers[2];
    if (!readers[0].open(a.path(), false) || !readers[1].open(b.path(), false)) {
        return false;
    }
    for (;;) {
        size_t got[2];
        const uint8_t* data[2];
        for (int i = 0; i < 2; ++i) {
            data[i] = readers[i].peek(1, got[i]);
        }
        const size_t len = std::min(got[0], got[1]);
        if (len == 0) {
            return readers[0].error() == 0 && readers[1].error() == 0;
        }
        if (memcmp(data[0], data[1], len) != 0) {
            return false;
        }
        readers[0].skip(len);
        readers[1].skip(len);
    }
}

// What two copies of a file in sets of the same name have in common, even when one was
// renumbered since.
std::string identity(const TreeFile& file) {
    const std::string name = file.name.text();
    return name.substr(std::min(name.find('-'), name.size()));
}

void leave_out(PlannedFile* file, const char* code, const std::string& words) {
    file->left_out = true;
    file->findings.push_back({true, code, words + "; left out", -1});
}

// Looks for copies among the files, which are from sets of the same name.
void find_copies_in(const std::vector<PlannedFile*>& files) {
    std::map<std::string, PlannedFile*> known;
    for (PlannedFile* newer : files) {
        const auto [it, fresh] = known.insert({identity(*newer->file), newer});
        PlannedFile* const older = it->second;
        if (fresh || older->file->dir == newer->file->dir) {
            continue;
        }
        if (!same_beginning(*older->file, *newer->file)) {
            newer->findings.push_back({true, "double",
                                       "started at the same second as " + older->file->shown() +
                                           " in a set of the same name",
                                       -1});
        } else if (older->file->size < newer->file->size) {
            leave_out(older, "copy", "the beginning of " + newer->file->shown());
            it->second = newer;
        } else {
            leave_out(
                newer, "copy",
                (older->file->size == newer->file->size ? "a copy of " : "the beginning of ") +
                    older->file->shown());
        }
    }
}

// Set by set, as there may be very many files: mostly a name is that of a single set.
void find_copies(const LogStream& stream, std::vector<PlannedFile>* plan) {
    std::map<std::string, std::set<const TreeSet*>> sets;
    for (const StreamFile& place : stream.files) {
        sets[place.set->name].insert(place.set);
    }
    for (const auto& [name, same] : sets) {
        std::vector<PlannedFile*> files;
        for (size_t i = 0; i < plan->size() && same.size() > 1 && !name.empty(); ++i) {
            if (same.count(stream.files[i].set)) {
                files.push_back(&(*plan)[i]);
            }
        }
        find_copies_in(files);
    }
}

// Two media of a handset may be two ROOTs, but so may two handsets.
void find_other_roots(const LogStream& stream, std::vector<PlannedFile>* plan) {
    const TreeSet* before = nullptr;
    for (size_t i = 0; i < plan->size(); ++i) {
        const TreeSet* const set = stream.files[i].set;
        PlannedFile& each = (*plan)[i];
        if (each.left_out) {
            continue;
        }
        if (before && before->handset != set->handset && !set->given) {
            each.findings.push_back({false, "root", "from another ROOT than the one before", -1});
        }
        before = set;
    }
}

void find_gaps(std::vector<PlannedFile>* plan) {
    std::map<const TreeDir*, size_t> newest;  // of each directory
    size_t last = 0;
    for (size_t i = 0; i < plan->size(); ++i) {
        if (!(*plan)[i].left_out) {
            newest[(*plan)[i].file->dir] = last = i;
        }
    }
    for (size_t i = 0; i < plan->size(); ++i) {
        PlannedFile& each = (*plan)[i];
        const TreeFile& file = *each.file;
        if (each.left_out) {
            continue;
        }
        each.last = i == last;
        if (file.doubled && !file.set_aside) {
            each.findings.push_back({true, "double", "two log files with this number", -1});
        }
        // What follows a file of the stream is missing only when something newer is there; what
        // --until has cut off is not missing.
        const bool ends = file.first_missing() == 0;
        if (file.missing > 0 && (ends || newest[file.dir] != i)) {
            each.findings.push_back(
                {!(ends && each.last), "gap", "after it " + missing_text(file), -1});
        }
    }
}

}  // namespace

std::vector<PlannedFile> plan_stream(const LogStream& stream) {
    const CpType type = cp_type_of(stream.cp);
    std::vector<PlannedFile> plan(stream.files.size());
    for (size_t i = 0; i < plan.size(); ++i) {
        plan[i].file = stream.files[i].file;
        const CpType own = plan[i].file->name.cp_type;
        if (type != CT_UNKNOWN && own != CT_UNKNOWN && own != type) {
            leave_out(&plan[i], "name", "the name belongs to another CP");
        }
    }
    find_copies(stream, &plan);
    find_other_roots(stream, &plan);
    find_gaps(&plan);
    return plan;
}

const LogStream* choose_stream(const CommandLine& line, const std::vector<LogStream>& streams,
                               int* status) {
    const std::string wanted = line.value("cp", "");
    std::string names;
    for (const LogStream& stream : streams) {
        if (strcasecmp(stream.cp.c_str(), wanted.c_str()) == 0 ||
            (streams.size() == 1 && !line.has("cp"))) {
            return &stream;
        }
        names += (names.empty() ? "" : ", ") + stream.cp;
    }
    if (streams.empty()) {
        const bool cut = line.has("since") || line.has("until");
        *status = failure(ES_UNREADABLE, cut ? "no log files of that time" : "no log files there");
    } else if (line.has("cp")) {
        *status = failure(ES_UNREADABLE, "no log files of " + wanted + "; there are: " + names);
    } else {
        *status = line.usage_error("choose one with --cp: " + names);
    }
    return nullptr;
}
