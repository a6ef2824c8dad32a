// SPDX-License-Identifier: Apache-2.0

#include "kestlog/LogTree.h"

#include <dirent.h>
#include <errno.h>
#include <fcntl.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>

#include <algorithm>

#include "core/system_paths.h"

namespace {

bool is_dir(const std::string& path) {
    struct stat st;
    return stat(path.c_str(), &st) == 0 && S_ISDIR(st.st_mode);
}

std::string base_name(const std::string& path) {
    char* real = realpath(path.c_str(), nullptr);
    const std::string full = real ? real : path;
    free(real);
    return full.substr(full.rfind('/') + 1);
}

bool older(const TreeFile& a, const TreeFile& b) {
    if (a.name.time < b.name.time || b.name.time < a.name.time) {
        return a.name.time < b.name.time;
    }
    return a.name.number != b.name.number ? a.name.number > b.name.number
                                          : a.name.text < b.name.text;
}

}  // namespace

bool LogTree::list_dir(const std::string& path, std::vector<Entry>* entries) {
    DIR* dir = opendir(path.c_str());
    if (!dir) {
        failures.push_back(path + ": " + strerror(errno));
        return false;
    }
    while (const struct dirent* entry = readdir(dir)) {
        struct stat st;
        if (strcmp(entry->d_name, ".") == 0 || strcmp(entry->d_name, "..") == 0) {
            continue;
        }
        if (is_foreign_name(entry->d_name)) {
            foreign.push_back(path + "/" + entry->d_name);
        } else if (fstatat(dirfd(dir), entry->d_name, &st, AT_SYMLINK_NOFOLLOW) == 0) {
            entries->push_back({entry->d_name, S_ISDIR(st.st_mode), S_ISREG(st.st_mode),
                                static_cast<uint64_t>(st.st_size)});
        }
    }
    closedir(dir);
    std::sort(entries->begin(), entries->end(),
              [](const Entry& a, const Entry& b) { return a.name < b.name; });
    return true;
}

bool LogTree::read(const std::string& path) {
    bool found = false;
    for (const char* below : {DIR_MODEM_LOG, DIR_KEST DIR_MODEM_LOG}) {
        if (is_dir(path + below)) {
            read_root(path + below);
            found = true;
        }
    }
    if (found) {
        return true;
    }
    std::vector<Entry> entries;
    if (!list_dir(path, &entries)) {
        return true;
    }
    foreign.clear();  // the directory is read again below
    // The directory's own name shows what it is or, in a renamed copy, the names inside it.
    const std::string name = base_name(path);
    LogTime time;
    const auto any = [&entries](bool (*test)(const Entry&)) {
        return std::any_of(entries.begin(), entries.end(), test);
    };
    const auto is_set = [](const Entry& e) {
        LogTime t;
        return e.dir && parse_set_name(e.name, &t);
    };
    const auto is_cp = [](const Entry& e) { return e.dir && cp_type_of(e.name) != CT_UNKNOWN; };
    const auto is_ours = [](const Entry& e) {
        return e.file && FileName(e.name).type != LT_UNKNOWN;
    };
    if (name == &DIR_MODEM_LOG[1] || any(is_set)) {
        read_root(path);
    } else if (parse_set_name(name, &time) || any(is_cp)) {
        read_set(path, name);
    } else if (cp_type_of(name) != CT_UNKNOWN || any(is_ours)) {
        sets.push_back({"", path, {}});
        read_cp(path, name, &sets.back());
    } else {
        return false;
    }
    return true;
}

void LogTree::read_root(const std::string& path) {
    std::vector<Entry> entries;
    list_dir(path, &entries);
    for (const Entry& entry : entries) {
        const std::string full = path + "/" + entry.name;
        LogTime time;
        if (entry.dir && parse_set_name(entry.name, &time)) {
            read_set(full, entry.name);
        } else if (entry.file && (entry.name == DATABASE_NAME || entry.name == DIGEST_NAME)) {
            root_files.push_back({FileName(entry.name), full, entry.size});
        } else {
            strays.push_back(full);
        }
    }
}

void LogTree::read_set(const std::string& path, const std::string& name) {
    std::vector<Entry> entries;
    list_dir(path, &entries);
    sets.push_back({name, path, {}});
    for (const Entry& entry : entries) {
        if (entry.dir && cp_type_of(entry.name) != CT_UNKNOWN) {
            read_cp(path + "/" + entry.name, entry.name, &sets.back());
        } else {
            strays.push_back(path + "/" + entry.name);
        }
    }
}

void LogTree::read_cp(const std::string& path, const std::string& name, TreeSet* set) {
    std::vector<Entry> entries;
    list_dir(path, &entries);
    set->cps.push_back({name, path, {}});
    std::vector<TreeFile>& files = set->cps.back().files;
    for (const Entry& entry : entries) {
        if (entry.file) {
            files.push_back({FileName(entry.name), path + "/" + entry.name, entry.size});
        } else {
            strays.push_back(path + "/" + entry.name);
        }
    }
    std::sort(files.begin(), files.end(), older);
}
