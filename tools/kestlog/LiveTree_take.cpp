// SPDX-License-Identifier: Apache-2.0
// Comparing the tree as it was read with what is known of it.
#include <time.h>

#include <algorithm>

#include "common/text.h"
#include "kestlog/LiveTree.h"

namespace {

constexpr time_t REST_SECONDS = 2;

std::string parent(const std::string& path) {
    return path.substr(0, path.rfind('/'));
}

}  // namespace

void LiveTree::take(LogTree& tree, const std::set<std::string>& roots) {
    const bool tell = m_taken;
    m_taken = true;
    std::set<std::string> sets, dirs;
    std::map<std::string, std::string> newest;  // set of each log root
    for (const TreeSet& set : tree.sets) {
        sets.insert(set.shown());
        newest[parent(set.shown())] = set.shown();
        for (const TreeCp& cp : set.cps) {
            dirs.insert(cp.dir->name());
        }
    }
    take_roots(roots, tell);
    leave(sets, dirs);
    for (TreeSet& set : tree.sets) {
        const bool is_new = m_sets.count(set.shown()) == 0;
        m_sets[set.shown()] = true;
        if (is_new && tell) {
            tell_set(set);
        }
        // A renamed directory may hold the files of several CPs.
        std::map<std::string, std::vector<const TreeFile*>> files;
        for (const TreeCp& cp : set.cps) {
            std::vector<const TreeFile*>& all = files[cp.dir->name()];
            for (const TreeFile& file : cp.files) {
                all.push_back(&file);
            }
        }
        for (const auto& [path, all] : files) {
            Dir& dir = m_dirs[path];
            dir.path = path;
            dir.medium = set.medium();
            dir.set = set.name;
            dir.handset = set.handset;
            dir.cp = file_part(path);
            dir.present = true;
            take_files(dir, all, tell && (!is_new || newest[parent(set.shown())] == set.shown()));
        }
        for (TreeCp& cp : set.cps) {
            cp.files = std::vector<TreeFile>();
        }
    }
}

// What lies in one that is told already is not told, too.
void LiveTree::take_roots(const std::set<std::string>& roots, bool tell) {
    const auto tell_others = [this](const char* name, const char* words,
                                    const std::set<std::string>& all,
                                    const std::set<std::string>& known) {
        std::string told;
        for (const std::string& root : all) {
            if (known.count(root) == 0 && (told.empty() || root.find(told + "/") != 0)) {
                told = root;
                LiveEvent event(name, "", escape_text(root) + words);
                event.json["path"] = json_text(root);
                m_tell(event);
            }
        }
    };
    if (tell) {
        tell_others("gone", " is gone", m_roots, roots);
        tell_others("root", " is there", roots, m_roots);
    }
    m_roots = roots;
}

// Of a log root that is gone the sets are not told, too.
void LiveTree::leave(const std::set<std::string>& sets, const std::set<std::string>& dirs) {
    for (auto& [path, present] : m_sets) {
        if (!present || sets.count(path)) {
            continue;
        }
        present = false;
        if (m_roots.count(parent(path))) {
            LiveEvent event("gone", "", escape_text(path) + " is gone");
            event.json["path"] = json_text(path);
            m_tell(event);
        }
    }
    for (auto& [path, dir] : m_dirs) {
        if (dir.present && dirs.count(path) == 0) {
            dir.present = false;
            for (const auto& [name, file] : dir.files) {
                forget({&dir, name});
            }
        }
    }
}

void LiveTree::tell_set(const TreeSet& set) {
    uint64_t files = 0;
    uint64_t size = 0;
    for (const TreeCp& cp : set.cps) {
        for (const TreeFile& file : cp.files) {
            ++files;
            size += file.size;
        }
    }
    const std::string name = set.name.empty() ? set.shown() : set.name;
    LiveEvent event("set", set.medium(),
                    "new set: " + escape_text(name) + ", " + files_text(files, size));
    event.json.update({{"medium", json_text(set.medium())},
                       {"set", json_text(set.name)},
                       {"path", json_text(set.shown())},
                       {"files", files},
                       {"size", size}});
    m_tell(event);
}

// The service may have renamed, deleted and created files since they were looked at.
void LiveTree::take_files(Dir& dir, const std::vector<const TreeFile*>& files, bool tell) {
    std::vector<const TreeFile*> unknown;  // oldest first
    for (const TreeFile* seen : files) {
        const auto it = dir.files.find(seen->name.text());
        if (it == dir.files.end()) {
            unknown.push_back(seen);
            continue;
        }
        it->second.seen = true;
        if (it->second.size != seen->size) {
            written(dir, seen->name.text());
        }
    }
    std::map<std::string, std::vector<FileName>> lost;  // by lasting name
    for (auto& [name, file] : dir.files) {
        if (!file.seen) {
            const FileName file_name(name);
            lost[lasting_name(file_name)].push_back(file_name);
        }
        file.seen = false;
    }
    for (auto& [name, list] : lost) {  // the oldest last
        std::sort(list.begin(), list.end(),
                  [](const FileName& a, const FileName& b) { return a.number < b.number; });
    }
    std::vector<const TreeFile*> fresh;
    for (const TreeFile* seen : unknown) {
        const std::string& name = seen->name.text();
        std::vector<FileName>& list = lost[lasting_name(seen->name)];
        if (list.empty()) {
            fresh.push_back(seen);
            continue;
        }
        moved(dir, list.back().text(), name);
        const bool counted_up = list.back().number == 0 && seen->name.number > 0;
        list.pop_back();
        written(dir, name);
        if (counted_up) {
            closed(dir, name);
        }
    }
    for (const auto& [name, list] : lost) {
        for (const FileName& file : list) {
            removed(dir, file.text());
        }
    }
    for (const TreeFile* seen : fresh) {
        add(dir, seen->name.text(), {seen->size}, tell);
        // Whether it was closed meanwhile is not known; a file that the service has counted up,
        // or writes in one go, was. One that was just written to may be a copy in progress.
        const bool at_rest = seen->modified < time(nullptr) - REST_SECONDS;
        if (tell && seen->size > 0 &&
            (seen->name.is_log() ? seen->name.number > 0 && at_rest : seen->name.type != LT_DUMP)) {
            closed(dir, seen->name.text());
        }
    }
}
