// SPDX-License-Identifier: Apache-2.0

#include "kestlog/Archive.h"

#include <archive.h>
#include <archive_entry.h>
#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <string.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <algorithm>
#include <sstream>

#include "core/system_paths.h"
#include "kestlog/FileName.h"
#include "kestlog/GzipInput.h"
#include "kestlog/Progress.h"
#include "kestlog/Report.h"

namespace {

constexpr size_t BLOCK = 256 * 1024;
constexpr uint64_t MIB = 1024 * 1024;
constexpr uint64_t MAX_ENTRIES = 1000 * 1000;
constexpr uint64_t MAX_DRAINED = 64 * MIB;
constexpr uint64_t DIRECTORY = 4096;  // bytes that one takes in most file systems
constexpr size_t MAX_DEPTH = 32;      // of directories; a log tree has few

// The parts of an entry's name; empty when it leads out of the directory.
std::vector<std::string> safe_parts(const std::string& name) {
    std::vector<std::string> parts;
    std::istringstream in(name);
    if (name[0] == '/') {
        return {};
    }
    for (std::string part; std::getline(in, part, '/');) {
        if (part == "..") {
            return {};
        }
        if (!part.empty() && part != ".") {
            parts.push_back(part);
        }
    }
    return parts;
}

// Whether it may be part of a log tree: a card has photos, too. What lies at the top may be in the
// directory of a CP.
bool may_belong(const std::vector<std::string>& parts, bool is_dir) {
    LogTime time;
    for (const std::string& part : parts) {
        if (part == &DIR_MODEM_LOG[1] || parse_set_name(part, &time) ||
            cp_type_of(part) != CT_UNKNOWN) {
            return true;
        }
    }
    return !is_dir && (parts.size() == 1 || FileName(parts.back()).type != LT_UNKNOWN);
}

class Unpacker {
public:
    Unpacker(const std::string& name, const std::string& dir, uint64_t limit)
        : m_name(name),
          m_dir(dir),
          m_limit(limit),
          m_filters(archive_read_new()),
          m_in(archive_read_new()) {
        struct statvfs fs;
        if (m_limit == 0 && statvfs(dir.c_str(), &fs) == 0) {
            m_limit = static_cast<uint64_t>(fs.f_bavail) * fs.f_frsize / 10 * 9;
        }
        // None of those that run another program; gzip's is ours.
        archive_read_support_filter_bzip2(m_filters);
        archive_read_support_filter_xz(m_filters);
        archive_read_support_filter_lzma(m_filters);
        archive_read_support_filter_zstd(m_filters);
        archive_read_support_filter_lz4(m_filters);
        archive_read_support_filter_compress(m_filters);
        archive_read_support_format_raw(m_filters);
        archive_read_support_format_tar(m_in);
        archive_read_support_format_zip(m_in);
    }
    ~Unpacker() {
        archive_read_free(m_in);
        archive_read_free(m_filters);
    }
    Unpacker(const Unpacker&) = delete;
    Unpacker& operator=(const Unpacker&) = delete;

    bool begins() {
        struct archive_entry* entry;
        if (!open_archive()) {
            return false;
        }
        const int got = archive_read_next_header(m_in, &entry);
        return got != ARCHIVE_EOF && got != ARCHIVE_FATAL;
    }

    Unpacked run() {
        struct archive_entry* entry;
        if (!open_archive()) {
            return m_result;
        }
        bool whole = true;
        bool skipping = false;
        for (int got; !m_full && (got = archive_read_next_header(m_in, &entry)) != ARCHIVE_EOF;) {
            if (got == ARCHIVE_FATAL) {
                fail("", reason(m_in));
                whole = false;
                break;
            }
            m_result.is_archive = true;
            if (got == ARCHIVE_RETRY) {  // told of each block up to the next header
                if (!skipping) {
                    fail("?", "left out: " + reason(m_in));
                }
                skipping = true;
                continue;
            }
            skipping = false;
            if (++m_entries > MAX_ENTRIES) {
                fail("", "more than " + std::to_string(MAX_ENTRIES) +
                             " entries; the rest is left "
                             "out");
                break;
            }
            take(entry);
        }
        if (whole && !m_full && m_filtered && !drain()) {
            fail("", reason(m_filters));
        }
        if (m_more) {
            m_result.failures.push_back(m_name + ": " + std::to_string(m_more) +
                                        " more entries are left out or damaged");
        }
        return m_result;
    }

private:
    bool open_archive() {
        struct archive_entry* entry;
        const auto read_gzip = [](struct archive* in, void* gzip, const void** data) -> la_ssize_t {
            const la_ssize_t n = static_cast<GzipInput*>(gzip)->read(data);
            if (n < 0) {
                archive_set_error(in, EIO, "%s", static_cast<GzipInput*>(gzip)->error().c_str());
            }
            return n;
        };
        const bool ours = m_name == "-" || GzipInput::is_gzip(m_name);
        const int opened = !ours ? archive_read_open_filename(m_filters, m_name.c_str(), BLOCK)
                           : m_gzip.open(m_name)
                               ? archive_read_open(m_filters, &m_gzip, nullptr, read_gzip, nullptr)
                               : ARCHIVE_FATAL;
        if (opened != ARCHIVE_OK || archive_read_next_header(m_filters, &entry) != ARCHIVE_OK) {
            return false;
        }
        m_filtered = ours || archive_filter_code(m_filters, 0) != ARCHIVE_FILTER_NONE;
        if (!m_filtered) {  // a zip in a file is read from its end
            return archive_read_open_filename(m_in, m_name.c_str(), BLOCK) == ARCHIVE_OK;
        }
        const auto read = [](struct archive*, void* self, const void** data) {
            return static_cast<Unpacker*>(self)->read_filtered(data);
        };
        return archive_read_open(m_in, this, nullptr, read, nullptr) == ARCHIVE_OK;
    }

    // What the filters make of the file: the number of bytes, 0 at the end, -1 with the error set.
    la_ssize_t read_filtered(const void** data) {
        size_t len;
        la_int64_t offset;
        const int got = archive_read_data_block(m_filters, data, &len, &offset);
        if (got < ARCHIVE_WARN) {
            archive_set_error(m_in, EIO, "%s", reason(m_filters).c_str());
            return -1;
        }
        return got == ARCHIVE_EOF ? 0 : static_cast<la_ssize_t>(len);
    }

    // Reads on, so that the sum behind the data is seen: what follows the end of an archive is
    // mostly a few zeros, and no more than some MiB of it are read. False with the error set.
    bool drain() {
        const void* data;
        la_ssize_t n = 1;
        for (uint64_t done = 0; n > 0 && done < MAX_DRAINED; done += static_cast<uint64_t>(n)) {
            n = read_filtered(&data);
        }
        return n >= 0;
    }

    // Of what libarchive has just refused; it has no words for some of it.
    static std::string reason(struct archive* in) {
        const char* const text = archive_error_string(in);
        return text ? text : "damaged";
    }

    // entry: its name, or "" for the archive itself.
    void fail(const std::string& entry, const std::string& reason) {
        if (m_result.failures.size() == Unpacked::MAX_LINES && !entry.empty()) {
            ++m_more;
        } else {
            m_result.failures.push_back(m_name + (entry.empty() ? "" : "/" + entry) + ": " +
                                        reason);
        }
    }

    void take(struct archive_entry* entry) {
        // Null when the locale cannot hold it.
        const char* text = archive_entry_pathname(entry);
        text = text ? text : archive_entry_pathname_utf8(entry);
        if (!text || !*text) {
            return fail("?", "left out: its name cannot be read");
        }
        if (strlen(text) >= PATH_MAX) {  // a tar may have many of 1 MiB
            return fail("?", "left out: its name is too long");
        }
        const std::string name = text;
        const std::vector<std::string> parts = safe_parts(name);
        const bool is_dir = archive_entry_filetype(entry) == AE_IFDIR;
        if (parts.empty()) {
            if (name.find_first_not_of("./") != std::string::npos || !is_dir) {
                fail(name, "left out: its name leads out of the archive");
            }
            return;
        }
        if (archive_entry_hardlink(entry) || archive_entry_symlink(entry) ||
            (archive_entry_filetype(entry) != AE_IFREG && !is_dir)) {
            if (m_result.strays.size() < Unpacked::MAX_STRAYS) {
                m_result.strays.push_back(name);
            } else {
                ++m_more;
            }
            return;
        }
        if (!may_belong(parts, is_dir)) {
            return;
        }
        if (parts.size() > MAX_DEPTH) {
            return fail(name, "left out: too many directories");
        }
        std::string path = m_dir;
        for (size_t i = 0; i < parts.size(); ++i) {
            path += "/" + parts[i];
            if (i + 1 == parts.size() && !is_dir) {
                write_file(entry, name, path);
            } else if (mkdir(path.c_str(), 0700) == 0) {
                m_used += DIRECTORY;
                if (!has_room(0)) {
                    return;
                }
            } else if (errno != EEXIST) {
                return fail(name, std::string("left out: ") + strerror(errno));
            }
        }
    }

    void write_file(struct archive_entry* entry, const std::string& name, const std::string& path) {
        const int fd = open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
        if (fd < 0) {
            return fail(name, errno == EEXIST ? "left out: another entry has this name"
                                              : std::string("left out: ") + strerror(errno));
        }
        const uint64_t size = copy_data(fd, entry, name);
        m_used += size;
        const struct timespec times[2] = {{0, UTIME_OMIT}, {archive_entry_mtime(entry), 0}};
        futimens(fd, times);
        if (close(fd) < 0) {  // NFS writes only now
            fail(name, std::string("cut off: ") + strerror(errno));
        }
    }

    // The size that the file got.
    uint64_t copy_data(int fd, struct archive_entry* entry, const std::string& name) {
        uint64_t size = 0;
        const void* data;
        size_t len;
        la_int64_t offset;
        for (int got; (got = archive_read_data_block(m_in, &data, &len, &offset)) != ARCHIVE_EOF;) {
            if (got == ARCHIVE_FATAL || got == ARCHIVE_FAILED) {
                fail(name, "cut off: " + reason(m_in));
                return size;
            }
            if (got == ARCHIVE_WARN) {  // a wrong sum in a zip
                fail(name, "damaged: " + reason(m_in));
            }
            const uint64_t end = static_cast<uint64_t>(offset) + len;
            if (offset < 0 || !has_room(end)) {
                return size;
            }
            if (!write_at(fd, static_cast<const char*>(data), len, offset)) {
                fail(name, std::string("cut off: ") + strerror(errno));
                m_full = errno == ENOSPC;
                return size;
            }
            size = std::max(size, end);
            const uint64_t packed = m_gzip.is_open() ? m_gzip.offset()
                                                     : static_cast<uint64_t>(archive_filter_bytes(
                                                           m_filtered ? m_filters : m_in, -1));
            Progress::advance(packed - m_packed);
            m_packed = packed;
        }
        // A hole at the end is no data.
        const la_int64_t whole = archive_entry_size(entry);
        if (archive_entry_size_is_set(entry) && whole > 0 && static_cast<uint64_t>(whole) > size &&
            has_room(static_cast<uint64_t>(whole))) {
            if (ftruncate(fd, whole) == 0) {
                return static_cast<uint64_t>(whole);
            }
            fail(name, std::string("cut off: ") + strerror(errno));
        }
        return size;
    }

    // Whether a file may become so large. A hole counts, too: what reads the file reads it.
    bool has_room(uint64_t size) {
        if (size > m_limit || m_used + size > m_limit) {
            m_full = true;
            fail("", "unpacked it is larger than the " + std::to_string(m_limit / MIB) +
                         " MiB that it may take in " + m_dir.substr(0, m_dir.rfind('/')) +
                         "; choose another directory by TMPDIR or see --unpack-limit");
        }
        return !m_full;
    }

    static bool write_at(int fd, const char* data, size_t len, off_t offset) {
        while (len > 0) {
            const ssize_t n = pwrite(fd, data, len, offset);
            if (n < 0 && errno == EINTR) {
                continue;
            }
            if (n < 0) {
                return false;
            }
            data += n;
            offset += n;
            len -= static_cast<size_t>(n);
        }
        return true;
    }

    const std::string m_name;
    const std::string m_dir;
    uint64_t m_limit;
    GzipInput m_gzip;
    struct archive* m_filters;  // a bare reader of what they make of the file
    struct archive* m_in;       // reads that or, without a filter, the file
    bool m_filtered = false;
    Unpacked m_result;
    uint64_t m_entries = 0;
    uint64_t m_used = 0;
    uint64_t m_more = 0;
    uint64_t m_packed = 0;  // bytes of the archive itself so far
    bool m_full = false;
};

}  // namespace

bool is_archive(const std::string& path) {
    struct stat st;
    const bool exact = FileName(path.substr(path.rfind('/') + 1)).exact;
    return (path == "-" || (!exact && stat(path.c_str(), &st) == 0 && S_ISREG(st.st_mode))) &&
           Unpacker(path, "", 1).begins();
}

Unpacked unpack_archive(const std::string& path, const std::string& dir, uint64_t limit) {
    const Progress progress(path == "-" ? 0 : total_size({path}));
    return Unpacker(path, dir, limit).run();
}
