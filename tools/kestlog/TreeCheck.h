// SPDX-License-Identifier: Apache-2.0
// Looks at every file of a tree once, oldest set first, and tells a visitor what is wrong with
// names, numbers and contents, and what could not be read.
#ifndef KESTLOG_TREECHECK_H_
#define KESTLOG_TREECHECK_H_

#include <string>

#include "kestlog/FileScan.h"
#include "kestlog/LogTree.h"

// A file and where it is. Set and CP are null for what lies in a log root itself.
struct FilePlace {
    const TreeSet* set;
    const TreeCp* cp;
    const TreeFile* file;
};

class TreeVisitor {
public:
    virtual ~TreeVisitor() = default;

    // Before anything is found about the file. The result sees its frames,
    // of which it does not get the payload, or chunks.
    virtual PieceVisitor begin(const FilePlace&) { return nullptr; }
    // The path is one for humans.
    virtual void find(const std::string& path, const Finding& finding) = 0;
    virtual void unreadable(const std::string& words) = 0;
    // After the file was scanned, as far as it could be.
    virtual void end(const FilePlace&, const FileReport&) {}
};

void check_tree(const LogTree& tree, TreeVisitor& visitor);

#endif  // KESTLOG_TREECHECK_H_
