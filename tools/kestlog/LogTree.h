// SPDX-License-Identifier: Apache-2.0
// The directories of a log tree: log roots contain sets, sets contain CP directories, and
// those contain files. Links are listed as strays and never followed.
#ifndef KESTLOG_LOGTREE_H_
#define KESTLOG_LOGTREE_H_

#include <string>
#include <vector>

#include "kestlog/FileName.h"

struct TreeFile {
    FileName name;
    std::string path;
    uint64_t size;
};

struct TreeCp {
    std::string name;
    std::string path;
    std::vector<TreeFile> files;  // by time, oldest first
};

struct TreeSet {
    std::string name;  // "" when only a CP directory was given
    std::string path;
    std::vector<TreeCp> cps;
};

struct LogTree {
    // Reads the directory at path: a medium's top directory, a log root, a set or a CP
    // directory. False when it is not one of them. What cannot be read goes to failures.
    bool read(const std::string& path);

    std::vector<TreeFile> root_files;  // in the log roots themselves
    std::vector<TreeSet> sets;         // oldest first
    std::vector<std::string> strays;   // paths of what does not belong there
    std::vector<std::string> foreign;  // paths of what a PC left there
    std::vector<std::string> failures;

private:
    struct Entry {
        std::string name;
        bool dir;
        bool file;
        uint64_t size;
    };

    // Lists a directory by name, without foreign entries. False, with an entry in failures,
    // when it cannot be read.
    bool list_dir(const std::string& path, std::vector<Entry>* entries);
    void read_root(const std::string& path);
    void read_set(const std::string& path, const std::string& name);
    void read_cp(const std::string& path, const std::string& name, TreeSet* set);
};

#endif  // KESTLOG_LOGTREE_H_
