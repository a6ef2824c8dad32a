// SPDX-License-Identifier: Apache-2.0

#include "sim/LogCollector.h"

#include <ctype.h>
#include <fcntl.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "sim/SimHandset.h"

namespace fs = std::filesystem;

namespace {

std::vector<uint8_t> read_range(int fd, off_t from, size_t len) {
    std::vector<uint8_t> data(len);
    size_t done = 0;
    while (done < len) {
        const ssize_t n =
            pread(fd, data.data() + done, len - done, from + static_cast<off_t>(done));
        if (n <= 0) {
            break;
        }
        done += static_cast<size_t>(n);
    }
    data.resize(done);
    return data;
}

std::vector<uint8_t> read_file(int fd, const struct stat& st) {
    return read_range(fd, 0, static_cast<size_t>(st.st_size));
}

// The paths in a directory; what vanishes while it is read is left out.
std::vector<fs::path> entries(const std::string& dir) {
    std::vector<fs::path> paths;
    std::error_code ec;
    for (fs::directory_iterator it(dir, ec), end; !ec && it != end; it.increment(ec)) {
        paths.push_back(it->path());
    }
    return paths;
}

// "<number>-....log"
bool is_log_name(const std::string& name, unsigned long* number) {
    char* end;
    *number = strtoul(name.c_str(), &end, 10);
    return isdigit(static_cast<unsigned char>(name[0])) && *end == '-' && name.size() > 4 &&
           name.compare(name.size() - 4, 4, ".log") == 0;
}

}  // namespace

LogCollector::LogCollector(const SimHandset& handset, bool kest_dir) : m_handset(handset) {
    const std::string below = std::string(kest_dir ? "/kest" : "") + "/modem_log";
    m_media.resize(2);
    m_media[0].name = "internal";
    m_media[0].log_root = handset.path("data") + below;
    m_media[0].quota = static_cast<uint64_t>(handset.sizes().data) << 20;
    m_media[1].name = "SD card";
    m_media[1].log_root = handset.sd_root() + below;
    m_media[1].quota = static_cast<uint64_t>(handset.sizes().sd) << 20;
    for (const auto& cp : handset.cps()) {
        m_checks.emplace_back(cp->stream);
    }
}

LogCollector::~LogCollector() {
    for (const LogFileSeen& file : m_seen) {
        close(file.fd);
    }
}

void LogCollector::set_quota(const std::string& medium, unsigned mb) {
    for (Medium& m : m_media) {
        if (m.name == medium) {
            m.quota = static_cast<uint64_t>(mb) << 20;
        }
    }
}

size_t LogCollector::index_of(const std::string& cp_name) const {
    const auto& cps = m_handset.cps();
    const auto found =
        std::find_if(cps.begin(), cps.end(), [&](const auto& cp) { return cp->name == cp_name; });
    return static_cast<size_t>(found - cps.begin());
}

void LogCollector::scan() {
    for (LogFileSeen& file : m_seen) {
        file.dir.clear();
    }
    for (Medium& medium : m_media) {
        medium.bytes = 0;
        medium.files = medium.sets = 0;
        std::error_code ec;
        for (const fs::path& set : entries(medium.log_root)) {
            if (!fs::is_directory(set, ec)) {
                continue;
            }
            ++medium.sets;
            for (const fs::path& cp_dir : entries(set.string())) {
                scan_cp_dir(medium, cp_dir.string(), index_of(cp_dir.filename().string()));
            }
        }
    }
    for (size_t i = 0; i < m_seen.size();) {
        const LogFileSeen& file = m_seen[i];
        struct stat st;
        if (fstat(file.fd, &st) == 0 && st.st_nlink == 0) {
            const std::vector<uint8_t> data = read_file(file.fd, st);
            m_checks[file.cp].add_file(data.data(), data.size(), true);
            ++m_trimmed_files;
            m_trimmed_bytes += data.size();
            close(file.fd);
            m_seen.erase(m_seen.begin() + static_cast<std::ptrdiff_t>(i));
        } else {
            ++i;
        }
    }
}

void LogCollector::scan_cp_dir(Medium& medium, const std::string& dir, size_t cp) {
    for (const fs::path& path : entries(dir)) {
        struct stat st;
        if (lstat(path.c_str(), &st) != 0 || !S_ISREG(st.st_mode)) {
            continue;
        }
        ++medium.files;
        medium.bytes += static_cast<uint64_t>(st.st_size);
        const int64_t written = st.st_mtim.tv_sec * 1000000000LL + st.st_mtim.tv_nsec;
        if (written > m_last_write) {
            m_last_write = written;
            m_in_use = static_cast<int>(&medium - m_media.data());
        }
        unsigned long number;
        if (cp >= m_checks.size() || !is_log_name(path.filename().string(), &number)) {
            continue;
        }
        auto seen = std::find_if(m_seen.begin(), m_seen.end(), [&](const LogFileSeen& f) {
            return f.dev == st.st_dev && f.ino == st.st_ino;
        });
        if (seen == m_seen.end()) {
            // The file may have been renamed since: the one that is opened counts.
            const int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
            if (fd < 0 || fstat(fd, &st) != 0) {
                continue;
            }
            seen = std::find_if(m_seen.begin(), m_seen.end(), [&](const LogFileSeen& f) {
                return f.dev == st.st_dev && f.ino == st.st_ino;
            });
            if (seen == m_seen.end()) {
                m_seen.push_back({fd, st.st_dev, st.st_ino, cp, "", 0});
                seen = m_seen.end() - 1;
            } else {
                close(fd);
            }
        }
        seen->dir = dir;
        seen->number = number;
    }
}

uint64_t LogCollector::end_position(const SimCp& cp) const {
    const size_t index = index_of(cp.name);
    // Long enough to hold a whole block, wherever the file ends.
    const off_t tail = 2 * SimStream::BLOCK_SIZE;
    uint64_t last = 0;
    for (const LogFileSeen& file : m_seen) {
        struct stat st;
        if (file.cp != index || fstat(file.fd, &st) != 0) {
            continue;
        }
        const off_t from = std::max<off_t>(0, st.st_size - tail);
        const auto data = read_range(file.fd, from, static_cast<size_t>(st.st_size - from));
        size_t offset;
        uint64_t pos;
        if (cp.stream.locate(data.data(), data.size(), &offset, &pos)) {
            last = std::max(last, pos + data.size() - offset);
        }
    }
    return last;
}

StreamCheck::Result LogCollector::check(const SimCp& cp) {
    scan();
    const size_t index = index_of(cp.name);
    StreamCheck check = m_checks[index];
    std::sort(m_seen.begin(), m_seen.end(), [](const LogFileSeen& a, const LogFileSeen& b) {
        return a.dir != b.dir ? a.dir < b.dir : a.number > b.number;
    });
    // In a directory the file with the higher number is the older one. Numbers may be
    // missing: the quota can take a file away right after it was closed.
    std::string dir;
    uint64_t previous = 0;
    for (const LogFileSeen& file : m_seen) {
        struct stat st;
        if (file.cp != index || fstat(file.fd, &st) != 0) {
            continue;
        }
        const std::vector<uint8_t> data = read_file(file.fd, st);
        const uint64_t first = check.add_file(data.data(), data.size(), false);
        if (first == UINT64_MAX) {
            continue;
        }
        if (file.dir == dir && first < previous) {
            check.add_misordered();
        }
        dir = file.dir;
        previous = first;
    }
    return check.result(cp.fed, cp.log.pending());
}
