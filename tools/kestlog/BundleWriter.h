// SPDX-License-Identifier: Apache-2.0
// Writes files of a tree into a tar, under names from which they are read as a tree again: below
// the modem_log of a medium where a handset's root has it.
#ifndef KESTLOG_BUNDLEWRITER_H_
#define KESTLOG_BUNDLEWRITER_H_

#include <stdint.h>

#include <set>
#include <string>

#include "kestlog/LogTree.h"
#include "kestlog/OutputFile.h"

struct archive;

class BundleWriter {
public:
    // The file must be open and outlive the object.
    explicit BundleWriter(OutputFile& out);
    ~BundleWriter();
    BundleWriter(const BundleWriter&) = delete;
    BundleWriter& operator=(const BundleWriter&) = delete;

    // Each is false when the tar could not be written; what cannot be read is told and counted.
    bool add_text(const std::string& name, const std::string& text);
    bool add_file(const TreeSet& set, const TreeCp& cp, const TreeFile& file);
    // A file beside the sets, such as the parsing database.
    bool add_root_file(const TreeSet& set, const TreeFile& file);
    bool finish();

    uint64_t files() const { return m_files; }
    uint64_t bytes() const { return m_bytes; }
    uint64_t unreadable() const { return m_unreadable; }

private:
    bool header(const std::string& name, uint64_t size, time_t modified);
    bool copy(const std::string& name, const TreeFile& file);

    struct archive* const m_archive;
    std::set<std::string> m_names;
    uint64_t m_files = 0;
    uint64_t m_bytes = 0;
    uint64_t m_unreadable = 0;
};

#endif  // KESTLOG_BUNDLEWRITER_H_
