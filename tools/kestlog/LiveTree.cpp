// SPDX-License-Identifier: Apache-2.0

#include "kestlog/LiveTree.h"

#include <limits.h>
#include <stdlib.h>
#include <sys/stat.h>

#include <algorithm>

#include "common/text.h"

namespace {

bool is_dsp_log(const FileName& name) {
    return name.is_log() && name.cp_type == CT_AGDSP;
}

}  // namespace

std::string LiveTree::lasting_name(const FileName& name) {
    return name.is_log() ? name.text().substr(name.text().find('-')) : name.text();
}

LiveEvent LiveTree::ready() const {
    uint64_t files = 0;
    uint64_t size = 0;
    for (const auto& [path, dir] : m_dirs) {
        for (const auto& [name, file] : dir.files) {
            ++files;
            size += file.size;
        }
    }
    LiveEvent event(
        "ready", "",
        "following " + count_text(m_sets.size(), "set") + ", " + files_text(files, size));
    event.json.update({{"sets", m_sets.size()}, {"files", files}, {"size", size}});
    return event;
}

LiveTree::Dir* LiveTree::dir(const std::string& path) {
    const auto it = m_dirs.find(path);
    return it == m_dirs.end() ? nullptr : &it->second;
}

void LiveTree::created(Dir& dir, const std::string& name) {
    struct stat st;
    // When it is gone the next change says where to, and its size is looked at there.
    const bool there = lstat((dir.path + "/" + name).c_str(), &st) == 0;
    if ((there && !S_ISREG(st.st_mode)) || is_foreign_name(name) ||
        (!there && has_next_name(dir, FileName(name)))) {
        return;
    }
    add(dir, name, {there ? static_cast<uint64_t>(st.st_size) : 0, there}, true);
}

// Whether the tree was read after the service counted the log file up.
bool LiveTree::has_next_name(const Dir& dir, const FileName& name) {
    const std::string lasting = lasting_name(name);
    return name.is_log() && std::any_of(dir.files.begin(), dir.files.end(), [&](const auto& file) {
               const size_t at = file.first.find('-');
               return at != std::string::npos &&
                      file.first.compare(at, std::string::npos, lasting) == 0 &&
                      FileName(file.first).is_log();
           });
}

void LiveTree::moved(Dir& dir, const std::string& from, const std::string& to) {
    const auto it = dir.files.find(from);
    const bool counted_up = it != dir.files.end() && FileName(from).exact;
    const File file = counted_up ? it->second : File();
    if (it != dir.files.end()) {
        dir.files.erase(it);
    }
    if (!counted_up) {
        // Known by its new name already, a stranger's, or what copies a tree gives a file its name
        // when it is whole.
        forget({&dir, from});
        created(dir, to);
        closed(dir, to);
        return;
    }
    for (std::set<Place>* places : {&m_closed, &m_written, &m_grown}) {
        if (places->erase({&dir, from})) {
            places->insert({&dir, to});
        }
    }
    dir.files[to] = file;  // the service counts its files up
}

void LiveTree::forget(const Place& place) {
    for (std::set<Place>* places : {&m_closed, &m_written, &m_grown}) {
        places->erase(place);
    }
}

void LiveTree::removed(Dir& dir, const std::string& name) {
    const auto it = dir.files.find(name);
    if (it != dir.files.end()) {
        ++dir.deleted;
        dir.deleted_size += it->second.size;
        dir.deleted_name = name;
        dir.files.erase(it);
        forget({&dir, name});
    }
}

void LiveTree::written(Dir& dir, const std::string& name) {
    const auto it = dir.files.find(name);
    if (it != dir.files.end()) {
        it->second.unchecked = true;
        m_written.insert({&dir, name});
        if (is_dsp_log(FileName(name))) {
            m_grown.insert({&dir, name});
        }
    }
}

void LiveTree::closed(Dir& dir, const std::string& name) {
    written(dir, name);
    if (dir.files.count(name)) {
        m_closed.insert({&dir, name});
    }
}

// The digest is written last.
void LiveTree::database_written(const std::string& root) {
    LiveEvent event("database", "", "new log parsing database in " + escape_text(root));
    event.json["path"] = json_text(root);
    m_tell(event);
}

void LiveTree::add(Dir& dir, const std::string& name, const File& file, bool tell) {
    const bool is_new = dir.files.insert({name, file}).second;
    if (is_new && tell) {
        written(dir, name);
        m_sums[cp_of(dir, name)].grown += file.size;
        tell_new(dir, FileName(name));
    } else if (is_new && name.compare(0, 2, "0-") == 0 && is_dsp_log(FileName(name))) {
        read_dumps(dir, FileName(name), false);  // what it holds is no news
    }
}

// The log file that was counted up to make room for a new one. Those with number 0, which may be
// very many on a card from anywhere, are not looked at.
std::string LiveTree::counted_up(const Dir& dir) {
    std::string before;
    unsigned long lowest = ULONG_MAX;
    for (auto it = dir.files.lower_bound("1"); it != dir.files.end(); ++it) {
        const unsigned long number = strtoul(it->first.c_str(), nullptr, 10);
        if (number > 0 && number < lowest && FileName(it->first).is_log()) {
            lowest = number;
            before = it->first;
        }
    }
    return before;
}

void LiveTree::tell_new(Dir& dir, const FileName& name) {
    const std::string shown = escape_text(name.text());
    if (name.type == LT_DUMP) {
        tell_crash(dir, name, name.kind(), dir.files.at(name.text()).size, false);
        return;
    }
    if (name.is_crash() || !name.exact) {
        return;  // told when it is complete
    }
    const std::string before = name.is_log() && name.number == 0 ? counted_up(dir) : std::string();
    if (before.empty()) {
        tell("file", dir, name, std::string("new ") + name.kind() + ": " + shown, Json::object());
        return;
    }
    look(dir, before);
    std::string words = "rotation: " + shown + " follows " + escape_text(before);
    Json more = {{"before", json_text(before)}};
    // When there was no time to look, it has the next name already.
    if (const File& full = dir.files.at(before); full.sized) {
        words += ", " + size_text(full.size);
        more["before_size"] = full.size;
    }
    tell("rotation", dir, name, words, more);
}

std::string LiveTree::cp_of(const Dir& dir, const std::string& name) {
    const std::string cp = cp_type_of(dir.cp) == CT_UNKNOWN ? FileName(name).cp() : dir.cp;
    return cp.empty() ? dir.cp : cp;
}

void LiveTree::tell(const char* event, const Dir& dir, const FileName& name,
                    const std::string& words, const Json& more) {
    const std::string cp = cp_of(dir, name.text());
    LiveEvent told(event, dir.medium + " " + cp, words);
    told.json.update({{"medium", json_text(dir.medium)},
                      {"set", json_text(dir.set)},
                      {"cp", json_text(cp)},
                      {"file", json_text(name.text())},
                      {"kind", name.kind()},
                      {"size", dir.files.at(name.text()).size}});
    told.json.update(more);
    m_tell(told);
}

void LiveTree::tell_crash(const Dir& dir, const FileName& name, const std::string& kind,
                          uint64_t size, bool complete) {
    const std::string shown = escape_text(name.text());
    tell("crash", dir, name,
         complete ? kind + " is complete: " + shown + ", " + size_text(size)
                  : kind + " begins: " + shown,
         {{"kind", kind}, {"size", size}, {"state", complete ? "complete" : "begins"}});
}

void LiveTree::tell_damage(const Dir& dir, const FileName& name, const Finding& finding) {
    tell("damage", dir, name, escape_text(name.text() + ": " + finding_text(finding)),
         finding_json(finding));
}

void LiveTree::tell_deleted(Dir& dir) {
    const bool one = dir.deleted == 1;
    const std::string files =
        one ? escape_text(dir.deleted_name) + ", " + size_text(dir.deleted_size)
            : files_text(dir.deleted, dir.deleted_size);
    LiveEvent event("deleted", dir.medium + " " + dir.cp, "deleted: " + files);
    event.json.update({{"medium", json_text(dir.medium)},
                       {"set", json_text(dir.set)},
                       {"cp", json_text(dir.cp)},
                       {"files", dir.deleted},
                       {"size", dir.deleted_size}});
    if (one) {
        event.json["file"] = json_text(dir.deleted_name);
    }
    dir.deleted = dir.deleted_size = 0;
    m_tell(event);
}
