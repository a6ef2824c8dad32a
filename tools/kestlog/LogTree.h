// The directories of a log tree: log roots with their sets, these with their CP
// directories, these with their files. Links are listed as strays, never followed.
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
    // Reads what is found at path: a medium's top directory, a log root, a set or a CP
    // directory. False when it is none of them; what could not be read is in failures.
    bool read(const std::string& path);

    std::vector<TreeFile> root_files;  // in the log roots themselves
    std::vector<TreeSet> sets;         // oldest first
    std::vector<std::string> strays;   // paths of what does not belong where it is
    std::vector<std::string> foreign;  // paths of what a PC left there
    std::vector<std::string> failures;

private:
    struct Entry {
        std::string name;
        bool dir;
        bool file;
        uint64_t size;
    };

    // The entries of a directory by name, without foreign ones. False, with a failure, when
    // it cannot be read.
    bool list_dir(const std::string& path, std::vector<Entry>* entries);
    void read_root(const std::string& path);
    void read_set(const std::string& path, const std::string& name);
    void read_cp(const std::string& path, const std::string& name, TreeSet* set);
};

#endif  // KESTLOG_LOGTREE_H_
