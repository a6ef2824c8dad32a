// SPDX-License-Identifier: Apache-2.0

#include "kestlog/TreeInput.h"

#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <time.h>
#include <unistd.h>

#include <set>

#include "kestlog/ExitStatus.h"
#include "kestlog/Report.h"
#include "kestlog/option_numbers.h"

namespace {

constexpr char DIGITS[] = "0123456789";

struct TimeForm {
    const char* format;
    bool day;  // the text gives the day
    int rest;  // seconds to the end of what it names
};

// clang-format off
constexpr TimeForm FORMS[] = {
    {"%Y-%m-%d %H:%M:%S", true,  0},
    {"%Y-%m-%d %H:%M",    true,  59},
    {"%Y-%m-%dT%H:%M:%S", true,  0},
    {"%Y-%m-%dT%H:%M",    true,  59},
    {"%Y-%m-%d_%H-%M-%S", true,  0},   // as in the name of a file
    {"%Y-%m-%d-%H-%M-%S", true,  0},   // as that of a set
    {"%Y-%m-%d",          true,  24 * 60 * 60 - 1},
    {"%H:%M:%S",          false, 0},
    {"%H:%M",             false, 59},
};

constexpr struct { char letter; int64_t seconds; } UNITS[] = {
    {'s', 1}, {'m', 60}, {'h', 60 * 60}, {'d', 24 * 60 * 60},
};
// clang-format on

// "-10m".
bool parse_age(const std::string& text, int64_t* seconds) {
    const size_t digits = text.find_first_not_of(DIGITS, 1);
    if (text[0] != '-' || digits == 1 || digits > 10 || digits + 1 != text.size()) {
        return false;
    }
    for (const auto& unit : UNITS) {
        if (unit.letter == text[digits]) {
            *seconds = std::stoll(text.substr(1, digits - 1)) * unit.seconds;
            return true;
        }
    }
    return false;
}

bool read_time(const CommandLine& line, const char* option, const LogTime& newest, bool end,
               LogTime* time, int* status) {
    if (!line.has(option) || parse_time(line.value(option, ""), newest, end, time)) {
        return true;
    }
    *status = line.usage_error("--" + std::string(option) + ": '" + line.value(option, "") +
                               "' is not a time");
    return false;
}

// Applies --since and --until to a tree that is complete.
bool cut_tree(const CommandLine& line, LogTree* tree, int* status) {
    LogTime since, until;
    const LogTime newest = tree->newest();
    if (!read_time(line, "since", newest, false, &since, status) ||
        !read_time(line, "until", newest, true, &until, status)) {
        return false;
    }
    tree->cut(since, until);
    return true;
}

}  // namespace

int64_t seconds_of(const LogTime& time) {
    struct tm t = {};
    t.tm_year = time.year - 1900;
    t.tm_mon = time.month - 1;
    t.tm_mday = time.day;
    t.tm_hour = time.hour;
    t.tm_min = time.minute;
    t.tm_sec = time.second;
    return timegm(&t);
}

LogTime time_of(int64_t seconds) {
    const time_t value = seconds;
    struct tm t;
    return gmtime_r(&value, &t) ? LogTime::from_tm(t) : LogTime();
}

bool parse_time(const std::string& text, const LogTime& newest, bool end, LogTime* time) {
    int64_t age;
    if (!text.empty() && parse_age(text, &age)) {
        constexpr int64_t FIRST = -62135596800;  // the year 1: no other has a name before it
        *time = time_of(std::max(seconds_of(newest) - age, FIRST));
        return true;
    }
    for (const TimeForm& form : FORMS) {
        struct tm t = {};
        const char* const rest = strptime(text.c_str(), form.format, &t);
        if (!rest || *rest) {
            continue;
        }
        if (!form.day) {
            t.tm_year = newest.year - 1900;
            t.tm_mon = newest.month - 1;
            t.tm_mday = newest.day;
        }
        struct tm day = {};
        day.tm_year = t.tm_year;
        day.tm_mon = t.tm_mon;
        day.tm_mday = t.tm_mday;
        timegm(&day);
        if (form.day && day.tm_mday != t.tm_mday) {
            return false;  // 30 February
        }
        *time = time_of(timegm(&t) + (end ? form.rest : 0));
        return true;
    }
    return false;
}

bool open_tree(const CommandLine& line, LogTree* tree, int* status, LogTree::Files files) {
    return open_tree(line, line.params(), tree, status, files);
}

bool open_tree(const CommandLine& line, const Args& roots, LogTree* tree, int* status,
               LogTree::Files files) {
    constexpr uint64_t MIB = 1024 * 1024;
    uint64_t limit = 0;
    if (!read_whole(line, "unpack-limit", 0, UINT64_MAX / MIB, &limit, status)) {
        return false;
    }
    tree->limit_archives(limit * MIB);
    const std::string card = line.value("card", "");
    if (line.has("card") && !tree->add_card(card)) {
        *status = failure(ES_UNREADABLE, card + ": holds no logs");
        return false;
    }
    bool any = false;
    size_t handset = 0;
    for (const std::string& root : roots) {
        const size_t told = tree->failures.size();
        const size_t before = tree->sets.size();
        if (tree->add(root, files)) {
            any = true;
        } else if (tree->failures.size() == told) {
            tree->failures.push_back(
                root + (root == "-" ? ": no archive of a log tree" : ": not a log tree"));
        }
        for (size_t i = before; i < tree->sets.size(); ++i) {
            tree->sets[i].handset = handset;
        }
        ++handset;
    }
    tree->finish();
    if (!cut_tree(line, tree, status)) {
        return false;
    }
    if (!any) {
        *status = tell_failures(*tree);
    }
    return any;
}

bool select_files(const CommandLine& line, Args* files, int* status) {
    LogTree tree;
    for (const std::string& path : line.params()) {
        tree.add_file(path);
    }
    tree.finish();
    if (!cut_tree(line, &tree, status)) {
        return false;
    }
    std::set<std::string> kept;
    for (const TreeSet& set : tree.sets) {
        for (const TreeCp& cp : set.cps) {
            for (const TreeFile& file : cp.files) {
                kept.insert(file.path());
            }
        }
    }
    for (const std::string& path : line.params()) {
        // One that cannot be read is not left out, but an error.
        if (access(path.c_str(), R_OK) < 0 || kept.count(path) > 0) {
            files->push_back(path);
        }
    }
    return true;
}

int tell_failures(const LogTree& tree) {
    for (const std::string& words : tree.failures) {
        failure(ES_UNREADABLE, words);
    }
    return tree.failures.empty() ? ES_OK : ES_UNREADABLE;
}
