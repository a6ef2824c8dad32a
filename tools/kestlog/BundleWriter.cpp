// SPDX-License-Identifier: Apache-2.0

#include "kestlog/BundleWriter.h"

#include <archive.h>
#include <archive_entry.h>
#include <errno.h>
#include <string.h>

#include <algorithm>

#include "common/text.h"
#include "core/system_paths.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/Report.h"

namespace {

la_ssize_t write_out(struct archive*, void* out, const void* data, size_t len) {
    return static_cast<OutputFile*>(out)->write(data, len) ? static_cast<la_ssize_t>(len) : -1;
}

// "data/modem_log/".
std::string log_root_of(const TreeSet& set) {
    // Of several handsets the medium has the handset's name before its own.
    std::string medium = set.medium();
    std::string path = cut_ending(&medium, MEDIUM_INTERNAL) ? PATH_DATA_PARTITION
                       : cut_ending(&medium, MEDIUM_CARD)   ? CARD_IN_ROOT
                                                            : "";
    path += DIR_MODEM_LOG;
    return path.substr(1) + "/";
}

std::string set_name(const TreeSet& set) {
    return set.name.empty() ? set.time.set_stamp().string() : set.name;
}

// A copied directory may have any name; those of its files tell the CP.
std::string cp_name(const TreeCp& cp) {
    const auto named = std::find_if(cp.files.begin(), cp.files.end(),
                                    [](const TreeFile& file) { return !file.name.cp().empty(); });
    return cp_type_of(cp.name) != CT_UNKNOWN || named == cp.files.end() ? cp.name
                                                                        : named->name.cp();
}

}  // namespace

BundleWriter::BundleWriter(OutputFile& out) : m_archive(archive_write_new()) {
    archive_write_set_format_pax_restricted(m_archive);
    archive_write_add_filter_none(m_archive);
    archive_write_open(m_archive, &out, nullptr, write_out, nullptr);
}

BundleWriter::~BundleWriter() {
    // What was not finished is of no use: nothing more of it is written.
    archive_write_fail(m_archive);
    archive_write_free(m_archive);
}

bool BundleWriter::header(const std::string& name, uint64_t size, time_t modified) {
    struct archive_entry* const entry = archive_entry_new();
    archive_entry_set_pathname(entry, name.c_str());
    archive_entry_set_filetype(entry, AE_IFREG);
    archive_entry_set_perm(entry, 0644);
    archive_entry_set_size(entry, static_cast<la_int64_t>(size));
    archive_entry_set_mtime(entry, modified, 0);
    const bool good = archive_write_header(m_archive, entry) >= ARCHIVE_WARN;
    archive_entry_free(entry);
    return good;
}

bool BundleWriter::add_text(const std::string& name, const std::string& text) {
    return header(name, text.size(), time(nullptr)) &&
           archive_write_data(m_archive, text.data(), text.size()) ==
               static_cast<la_ssize_t>(text.size());
}

bool BundleWriter::add_file(const TreeSet& set, const TreeCp& cp, const TreeFile& file) {
    return copy(log_root_of(set) + set_name(set) + "/" + cp_name(cp) + "/" + file.name.text(),
                file);
}

bool BundleWriter::add_root_file(const TreeSet& set, const TreeFile& file) {
    return copy(log_root_of(set) + file.name.text(), file);
}

bool BundleWriter::copy(const std::string& name, const TreeFile& file) {
    LogReader in;
    const auto skip = [this, &file](const char* why) {
        ++m_unreadable;
        failure(ES_UNREADABLE, file.shown() + ": " + why);
    };
    if (!m_names.insert(name).second) {
        skip("left out: another medium has a file of this name");
        return true;
    }
    if (!in.open(file.path(), false)) {
        skip(strerror(errno));
        return true;
    }
    const uint64_t size = in.size();
    if (!header(name, size, in.modified())) {
        return false;
    }
    for (uint64_t left = size; left > 0;) {
        size_t got;
        const uint8_t* data = in.peek(1, got);
        if (got == 0) {
            // The rest becomes zeros: the size stands before the content.
            skip(in.error() ? strerror(in.error()) : "it has become shorter");
            break;
        }
        got = static_cast<size_t>(std::min<uint64_t>(got, left));
        if (archive_write_data(m_archive, data, got) != static_cast<la_ssize_t>(got)) {
            return false;
        }
        in.skip(got);
        left -= got;
    }
    ++m_files;
    m_bytes += size;
    return archive_write_finish_entry(m_archive) >= ARCHIVE_WARN;
}

bool BundleWriter::finish() {
    return archive_write_close(m_archive) == ARCHIVE_OK;
}
