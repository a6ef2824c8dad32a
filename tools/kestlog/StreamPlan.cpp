// SPDX-License-Identifier: Apache-2.0

#include "kestlog/StreamPlan.h"

#include <string.h>
#include <strings.h>

#include <algorithm>
#include <deque>
#include <map>
#include <utility>

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

// With how many others a file is compared: no CP begins more files in a second, and so the work
// stays small in a hostile tree where thousands have one start.
constexpr size_t COMPARED = 8;

void leave_out(PlannedFile* file, const char* code, const std::string& words) {
    file->left_out = true;
    file->findings.push_back({true, code, words + "; left out", -1});
}

// Places in a list of files, of those that may still be found.
using Places = std::deque<PlannedFile**>;

// Whether the file is found again among others. Each is then no longer among these, as there may
// be several with the same content.
bool find_copy(PlannedFile* file, bool whole, Places* others) {
    const TreeFile& newer = *file->file;
    const auto end = others->begin() + static_cast<ptrdiff_t>(std::min(others->size(), COMPARED));
    const auto it = std::find_if(others->begin(), end, [&](PlannedFile** other) {
        const TreeFile& older = *(*other)->file;
        return whole == (older.size == newer.size) && same_beginning(older, newer);
    });
    if (it == end) {
        return false;
    }
    const TreeFile& older = *(**it)->file;
    if (older.size < newer.size) {
        leave_out(**it, "copy", "the beginning of " + newer.shown());
        **it = file;
    } else {
        leave_out(file, "copy", (whole ? "a copy of " : "the beginning of ") + older.shown());
    }
    others->erase(it);
    return true;
}

// Looks for the files of a directory among those of others, and adds what was not found to them.
void find_copies_in(std::vector<PlannedFile*> files, std::vector<PlannedFile*>* known) {
    Places others;
    for (size_t i = 0; i < std::min(known->size(), files.size() + COMPARED); ++i) {
        others.push_back(&(*known)[i]);
    }
    // What has the same size may be just the same; only of the rest one may have grown.
    for (const bool whole : {true, false}) {
        std::vector<PlannedFile*> rest;
        for (PlannedFile* file : files) {
            if (!find_copy(file, whole, &others)) {
                rest.push_back(file);
            }
        }
        files.swap(rest);
    }
    // Where all others were found, the copy was made before these files were begun.
    for (PlannedFile* file : files) {
        if (!others.empty()) {
            file->findings.push_back({true, "double",
                                      "started at the same second as " +
                                          (*others[0])->file->shown() +
                                          " in a set of the same name",
                                      -1});
        }
    }
    known->insert(known->end(), files.begin(), files.end());
}

// Looks for copies that stand beside their originals under the name of a file that was set aside.
// Two such files of the service may both be empty, but hold the same only by chance.
void leave_out_namesakes(std::vector<PlannedFile*>* files) {
    for (size_t i = 0; i < files->size(); ++i) {
        PlannedFile* const older = (*files)[i];
        const size_t end = std::min(files->size(), i + 1 + COMPARED);
        for (size_t k = i + 1; k < end && !older->left_out; ++k) {
            PlannedFile* const newer = (*files)[k];
            const bool aside = older->file->name.aside();
            if ((aside || newer->file->name.aside()) && !newer->left_out &&
                older->file->size == newer->file->size && older->file->size > 0 &&
                same_beginning(*older->file, *newer->file)) {
                leave_out(aside ? older : newer, "copy",
                          "a copy of " + (aside ? newer : older)->file->shown());
            }
        }
    }
    files->erase(std::remove_if(files->begin(), files->end(),
                                [](const PlannedFile* file) { return file->left_out; }),
                 files->end());
}

// Looks for copies among the files, which are from sets of the same name. Copies have one start;
// their numbers may differ, as one may have been renumbered since.
void find_copies_among(const std::vector<PlannedFile*>& files) {
    std::map<LogTime, std::vector<PlannedFile*>> starts;
    for (PlannedFile* file : files) {
        starts[file->file->name.time()].push_back(file);
    }
    for (const auto& [time, begun] : starts) {
        std::map<const TreeDir*, size_t> places;
        std::vector<std::vector<PlannedFile*>> dirs;  // in the order of the stream
        for (PlannedFile* file : begun) {
            const auto [it, fresh] = places.insert({file->file->dir, dirs.size()});
            dirs.resize(dirs.size() + (fresh ? 1 : 0));
            dirs[it->second].push_back(file);
        }
        std::vector<PlannedFile*> known;
        for (std::vector<PlannedFile*>& dir : dirs) {
            leave_out_namesakes(&dir);
            find_copies_in(dir, &known);
        }
    }
}

// Set by set, as there may be very many files: mostly a name is that of a single set.
void find_copies(const LogStream& stream, std::vector<PlannedFile>* plan) {
    struct Sets {
        const TreeSet* first;
        bool compared = false;
        std::vector<PlannedFile*> files;
    };
    // What has no name is a set of its own.
    std::map<std::pair<std::string, const TreeSet*>, Sets> sets;
    const auto key = [](const TreeSet* set) {
        return std::pair(set->name, set->name.empty() ? set : nullptr);
    };
    for (const StreamFile& place : stream.files) {
        Sets& same = sets.insert({key(place.set), {place.set, false, {}}}).first->second;
        same.compared |= same.first != place.set || (place.file->name.aside() && !place.set->given);
    }
    for (size_t i = 0; i < plan->size(); ++i) {
        Sets& same = sets.at(key(stream.files[i].set));
        if (same.compared && !(*plan)[i].left_out) {
            same.files.push_back(&(*plan)[i]);
        }
    }
    for (const auto& [name, same] : sets) {
        find_copies_among(same.files);
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
        if (file.doubled) {
            each.findings.push_back(
                {!file.set_aside, "double", "two log files with this number", -1});
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
