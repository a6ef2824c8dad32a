// SPDX-License-Identifier: Apache-2.0
// kestlog ls.
#include <stdio.h>

#include <algorithm>
#include <map>
#include <nlohmann/json.hpp>
#include <set>

#include "common/text.h"
#include "kestlog/Commands.h"
#include "kestlog/Report.h"
#include "kestlog/TreeInput.h"

namespace {

struct Sum {
    uint64_t files = 0;
    uint64_t size = 0;
    LogTime first, last;

    void add(const TreeFile& file) {
        ++files;
        size += file.size;
        if (has_time(file.name.time())) {
            first = has_time(first) ? std::min(first, file.name.time()) : file.name.time();
            last = std::max(last, file.name.time());
        }
    }
};

// A line about a set or a CP.
void print_sum(bool json, const char* indent, const TreeSet& set, const TreeCp* cp,
               const Sum& sum) {
    if (json) {
        Json object = {{"set", json_text(set.name)}, {"medium", json_text(set.medium())}};
        if (cp) {
            object["cp"] = json_text(cp->name);
        } else {
            object["cps"] = set.cps.size();
        }
        object["files"] = sum.files;
        object["size"] = sum.size;
        object["from"] = time_text(sum.first);
        object["to"] = time_text(sum.last);
        print_json(object);
        return;
    }
    const std::string name = cp ? cp->name : set.name.empty() ? set.shown() : set.name;
    printf("%s%-*s %12llu bytes  %4llu files  %s to %s%s\n", indent, cp ? 22 : 24,
           escape_text(name).c_str(), static_cast<unsigned long long>(sum.size),
           static_cast<unsigned long long>(sum.files), time_text(sum.first).c_str(),
           time_text(sum.last).c_str(), cp ? "" : ("  on " + escape_text(set.medium())).c_str());
}

void print_file(bool json, const TreeSet* set, const TreeCp* cp, const TreeFile& file) {
    if (json) {
        Json object;
        if (set) {
            object["set"] = json_text(set->name);
        }
        object["medium"] = json_text(file.dir->medium());
        if (cp) {
            object["cp"] = json_text(cp->name);
        }
        object["path"] = json_text(file.shown());
        object["file"] = json_text(file.name.text());
        object["kind"] = file.name.kind();
        if (file.name.is_log()) {
            object["number"] = file.name.number;
        }
        object["size"] = file.size;
        object["time"] = time_text(file.name.time());
        print_json(object);
        return;
    }
    printf("%s%12llu  %-16s %s%s\n", set ? "    " : "", static_cast<unsigned long long>(file.size),
           file.name.kind(), escape_text(file.name.text()).c_str(),
           set ? "" : ("  on " + escape_text(file.dir->medium())).c_str());
}

// A line of the tree; the margin of the lines below it.
std::string print_branch(const std::string& margin, bool last, const std::string& text) {
    printf("%s%s %s\n", margin.c_str(), last ? "`--" : "|--", escape_text(text).c_str());
    return margin + (last ? "    " : "|   ");
}

void print_set(const TreeSet& set, bool last) {
    const std::string below = print_branch("", last, set.name.empty() ? set.shown() : set.name);
    for (const TreeCp& cp : set.cps) {
        const std::string margin = print_branch(below, &cp == &set.cps.back(), cp.name);
        for (const TreeFile& file : cp.files) {
            print_branch(margin, &file == &cp.files.back(),
                         file.name.text() + "  " + std::to_string(file.size));
        }
    }
}

// By media, which a list is not: there the sets of all media are in the order of their times.
void print_tree(const LogTree& tree) {
    std::map<std::string, const TreeSet*> last;  // of each medium
    for (const TreeFile& file : tree.root_files) {
        printf("%s  %llu\n", escape_text(file.shown()).c_str(),
               static_cast<unsigned long long>(file.size));
    }
    for (const TreeSet& set : tree.sets) {
        last[set.medium()] = &set;
    }
    std::set<std::string> done;
    for (const TreeSet& first : tree.sets) {
        if (!done.insert(first.medium()).second) {
            continue;
        }
        printf("%s\n", escape_text(first.medium()).c_str());
        for (const TreeSet& set : tree.sets) {
            if (set.medium() == first.medium()) {
                print_set(set, &set == last[set.medium()]);
            }
        }
    }
}

}  // namespace

int run_ls(const CommandLine& line) {
    LogTree tree;
    int status;
    if (!open_tree(line, &tree, &status)) {
        return status;
    }
    const bool json = line.has("json");
    if (line.has("tree") && !json) {
        print_tree(tree);
        return tell_failures(tree);
    }
    for (const TreeFile& file : tree.root_files) {
        print_file(json, nullptr, nullptr, file);
    }
    for (const TreeSet& set : tree.sets) {
        Sum sum;
        for (const TreeCp& cp : set.cps) {
            for (const TreeFile& file : cp.files) {
                sum.add(file);
            }
        }
        print_sum(json, "", set, nullptr, sum);
        for (const TreeCp& cp : set.cps) {
            Sum cp_sum;
            for (const TreeFile& file : cp.files) {
                cp_sum.add(file);
            }
            print_sum(json, "  ", set, &cp, cp_sum);
            for (const TreeFile& file : cp.files) {
                print_file(json, &set, &cp, file);
            }
        }
    }
    return tell_failures(tree);
}
