// SPDX-License-Identifier: Apache-2.0
// kestlog bundle.
#include <stdio.h>
#include <stdlib.h>
#include <strings.h>

#include <algorithm>
#include <set>

#include "common/text.h"
#include "kestlog/BundleWriter.h"
#include "kestlog/CardReport.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/Progress.h"
#include "kestlog/ReportPage.h"
#include "kestlog/TreeInput.h"
#include "kestlog/option_numbers.h"

namespace {

constexpr int64_t DAY_SECONDS = 24 * 60 * 60;
constexpr size_t MAX_CRASHES = 20;  // that an error lists

std::string crash_line(const Crash& crash) {
    return time_text(crash.time) + " " + crash.cp->name + " on " + crash.set->medium() + ": " +
           crash_text(crash);
}

void tell_crashes(const std::vector<Crash>& crashes) {
    for (size_t i = 0; i < std::min(crashes.size(), MAX_CRASHES); ++i) {
        failure(ES_UNREADABLE, crash_line(crashes[i]));
    }
    if (crashes.size() > MAX_CRASHES) {
        failure(ES_UNREADABLE, "and " + std::to_string(crashes.size() - MAX_CRASHES) + " more");
    }
}

// The crash nearest to the time, of any CP without a name; null, after printing which there are,
// when none is near.
const Crash* find_crash(const std::vector<Crash>& crashes, const LogTime& time,
                        const std::string& cp) {
    const auto distance = [&](const Crash& crash) {
        const bool wanted = cp.empty() || strcasecmp(crash.cp->name.c_str(), cp.c_str()) == 0;
        return wanted ? std::abs(seconds_of(crash.time) - seconds_of(time)) : INT64_MAX;
    };
    const auto nearest =
        std::min_element(crashes.begin(), crashes.end(),
                         [&](const Crash& a, const Crash& b) { return distance(a) < distance(b); });
    if (nearest != crashes.end() && distance(*nearest) <= DAY_SECONDS) {
        return &*nearest;
    }
    // Without a newest time in the tree there may be no day, either.
    failure(ES_UNREADABLE, crashes.empty()
                               ? "there is no crash at all"
                               : "no crash " + (cp.empty() ? "" : "of " + cp + " ") +
                                     "within a day of " + time_text(time) + "; there are:");
    tell_crashes(crashes);
    return nullptr;
}

template <typename T, typename Test>
void erase_if(std::vector<T>* list, Test test) {
    list->erase(std::remove_if(list->begin(), list->end(), test), list->end());
}

// The set beside which the file lies; null without one.
const TreeSet* set_beside(const LogTree& tree, const TreeFile& root_file) {
    const auto found =
        std::find_if(tree.sets.begin(), tree.sets.end(), [&root_file](const TreeSet& set) {
            return set.shown() == root_file.dir->shown() + set.name;
        });
    return found == tree.sets.end() ? nullptr : &*found;
}

// Leaves the parsing library of the media of the sets or, when they have none, of the first.
void reduce_databases(LogTree* tree) {
    std::vector<TreeFile>& files = tree->root_files;
    const auto beside = [tree](const TreeFile& file) { return set_beside(*tree, file); };
    if (std::any_of(files.begin(), files.end(), beside)) {
        erase_if(&files, [&](const TreeFile& file) { return !beside(file); });
    } else if (!files.empty()) {
        const TreeDir* const first = files[0].dir;
        erase_if(&files, [first](const TreeFile& file) { return file.dir != first; });
    }
}

// Leaves in the tree what belongs to the crash, which is part of it and no more valid then.
void reduce(const Crash& crash, int64_t seconds, LogTree* tree) {
    std::set<std::string> own;
    for (const TreeFile* file : crash.files) {
        own.insert(file->path());
    }
    const LogTime since = time_of(seconds_of(crash.time) - seconds);
    const LogTime until = time_of(seconds_of(crash.files.back()->name.time()) + seconds);
    const auto belongs = [&](const TreeFile& file) {
        const LogType type = file.name.type;
        const bool around = type == LT_LOG || type == LT_RINGBUF || type == LT_SLEEP_LOG;
        return own.count(file.path()) > 0 || type == LT_VERSION ||
               (around && !(file.end.time() < since) && !(until < file.name.time()));
    };
    const auto only_version = [](const TreeCp& cp) {
        return std::all_of(cp.files.begin(), cp.files.end(),
                           [](const TreeFile& file) { return file.name.type == LT_VERSION; });
    };
    for (TreeSet& set : tree->sets) {
        for (TreeCp& cp : set.cps) {
            erase_if(&cp.files, [&](const TreeFile& file) { return !belongs(file); });
        }
        erase_if(&set.cps, only_version);
    }
    erase_if(&tree->sets, [](const TreeSet& set) { return set.cps.empty(); });
    reduce_databases(tree);
    tree->strays.clear();
    tree->foreign.clear();
}

bool write_bundle(const LogTree& tree, const std::string& page, BundleWriter* bundle) {
    bool good = bundle->add_text("report.html", page);
    for (const TreeFile& file : tree.root_files) {
        const TreeSet* const set = set_beside(tree, file);
        good = good && bundle->add_root_file(set ? *set : tree.sets[0], file);
    }
    for (const TreeSet& set : tree.sets) {
        for (const TreeCp& cp : set.cps) {
            for (const TreeFile& file : cp.files) {
                good = good && bundle->add_file(set, cp, file);
            }
        }
    }
    return good && bundle->finish();
}

}  // namespace

int run_bundle(const CommandLine& line) {
    uint64_t minutes = 5;
    int status;
    if (!read_whole(line, "minutes", 0, DAY_SECONDS / 60, &minutes, &status)) {
        return status;
    }
    const bool listed = !line.has("crash");
    if (!listed && !line.has("output")) {
        return line.usage_error("-o FILE is missing");
    }
    LogTree tree;
    if ((!listed && !takes_binary(line, &status)) || !open_tree(line, &tree, &status)) {
        return status;
    }
    if (listed) {
        const std::vector<Crash> crashes = find_crashes(tree, find_dsp_crashes(tree));
        tell_crashes(crashes);
        return crashes.empty() ? failure(ES_UNREADABLE, "there is no crash at all")
                               : line.usage_error("--crash is missing: the time of one of these");
    }
    LogTime time;
    if (!parse_time(line.value("crash", ""), tree.newest(), false, &time)) {
        return line.usage_error("--crash: '" + line.value("crash", "") + "' is not a time");
    }
    const std::vector<Crash> crashes = find_crashes(tree, find_dsp_crashes(tree));
    tell_failures(tree);
    const Crash* const crash = find_crash(crashes, time, line.value("cp", ""));
    if (!crash) {
        return ES_UNREADABLE;
    }
    OutputFile out;
    if (!out.open(line.value("output", ""), line.has("force"))) {
        return out.failed();
    }
    const std::string about = crash_line(*crash);
    const std::string cp = crash->cp->name;
    reduce(*crash, static_cast<int64_t>(minutes) * 60, &tree);
    const Progress progress(2 * tree.size());  // for the report, and into the tar
    ReportOptions options;
    options.whole = false;
    CardReport report(tree, options);
    report.set_roots({about});
    BundleWriter bundle(out);
    if (!write_bundle(tree, report_page(report.json()), &bundle) || !out.close()) {
        return out.failed();
    }
    Progress::clear();
    if (out.path() == "-") {
        // The tar is there.
    } else if (line.has("json")) {
        print_json({{"path", json_text(out.path())},
                    {"crash", json_text(about)},
                    {"cp", json_text(cp)},
                    {"files", bundle.files()},
                    {"size", bundle.bytes()},
                    {"unreadable", bundle.unreadable()}});
    } else {
        printf("%s: %s; %llu files, %llu bytes", escape_text(out.path()).c_str(),
               escape_text(about).c_str(), static_cast<unsigned long long>(bundle.files()),
               static_cast<unsigned long long>(bundle.bytes()));
        if (bundle.unreadable()) {
            printf("; %llu left out or not whole",
                   static_cast<unsigned long long>(bundle.unreadable()));
        }
        printf("\n");
    }
    return bundle.unreadable() || !tree.failures.empty() ? ES_UNREADABLE : ES_OK;
}
