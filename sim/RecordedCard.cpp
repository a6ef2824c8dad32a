// SPDX-License-Identifier: Apache-2.0

#include "sim/RecordedCard.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <regex>
#include <tuple>

#include "sim/SimHandset.h"
#include "sim/StreamCheck.h"
#include "sim/byte_text.h"

namespace fs = std::filesystem;

namespace {

const uint8_t RECORD_MAGIC[] = {0x78, 0x56, 0x34, 0x12};

// Below what is given: nothing, or where a card, an internal medium and a handset have them.
const char* const LOG_ROOTS[] = {"",
                                 "/modem_log",
                                 "/kest/modem_log",
                                 "/data/modem_log",
                                 "/data/kest/modem_log",
                                 "/storage/sdcard0/modem_log",
                                 "/storage/sdcard0/kest/modem_log"};

bool is_set_name(const std::string& name) {
    static const std::regex SET("\\d{4}(-\\d\\d){5}");
    return std::regex_match(name, SET);
}

// "3-cp_wcdma-2016-03-01_09-15-00.log", also with "-1" behind the time.
bool parse_log_name(const std::string& name, const std::string& cp, RecordedFile* file) {
    static const std::regex LOG(
        "(\\d{1,9})-(.+)-(\\d{4})-(\\d\\d)-(\\d\\d)_(\\d\\d)-(\\d\\d)-(\\d\\d)(-\\d{1,9})?\\.log");
    std::smatch parts;
    if (!std::regex_match(name, parts, LOG) || parts[2] != cp) {
        return false;
    }
    const auto number = [&](size_t part) { return std::atoi(parts[part].str().c_str()); };
    tm t = {};
    t.tm_year = number(3) - 1900;
    t.tm_mon = number(4) - 1;
    t.tm_mday = number(5);
    t.tm_hour = number(6);
    t.tm_min = number(7);
    t.tm_sec = number(8);
    file->time = timegm(&t);
    file->number = static_cast<uint32_t>(number(1));
    if (parts[9].matched) {
        file->aside = static_cast<uint32_t>(-number(9));
    }
    return true;
}

// The higher number is the older one. Of equal ones the earlier, then the one set aside first.
bool older(const RecordedFile& a, const RecordedFile& b) {
    return std::tie(a.set, b.number, a.time, a.aside) < std::tie(b.set, a.number, b.time, b.aside);
}

}  // namespace

uint64_t RecordedCp::size() const {
    uint64_t sum = 0;
    for (const RecordedFile& file : files) {
        sum += file.size;
    }
    return sum;
}

bool RecordedCard::fail(const std::string& path, const std::string& what) {
    m_problems.push_back(show_name(path) + ": " + what);
    return false;
}

std::vector<std::string> RecordedCard::names_in(const std::string& dir) {
    std::vector<std::string> names;
    std::error_code ec;
    for (fs::directory_iterator it(dir, ec), end; !ec && it != end; it.increment(ec)) {
        names.push_back(it->path().filename().string());
    }
    if (ec) {
        fail(dir, ec.message());
    }
    std::sort(names.begin(), names.end());
    return names;
}

bool RecordedCard::is_directory(const std::string& path) {
    std::error_code ec;
    const fs::file_type type = fs::symlink_status(path, ec).type();
    return type == fs::file_type::directory ||
           fail(path, type == fs::file_type::symlink ? "a link, not followed" : "no directory");
}

bool RecordedCard::read(const std::string& root, bool clean) {
    m_clean = clean;
    std::vector<Set> sets;
    std::error_code ec;
    for (const std::string below : LOG_ROOTS) {
        const std::string log_root = root + below;
        if (below.empty()
                ? fs::is_directory(log_root, ec)
                : fs::exists(fs::symlink_status(log_root, ec)) && is_directory(log_root)) {
            find_sets(log_root, &sets);
        }
    }
    std::sort(sets.begin(), sets.end(), [](const Set& a, const Set& b) {
        return std::tie(a.name, a.path) < std::tie(b.name, b.path);
    });
    for (const Set& set : sets) {
        read_set(set);
        ++m_sets;
    }
    std::sort(m_cps.begin(), m_cps.end(),
              [](const RecordedCp& a, const RecordedCp& b) { return a.name < b.name; });
    for (RecordedCp& cp : m_cps) {
        std::sort(cp.files.begin(), cp.files.end(), older);
    }
    const fs::file_status status = fs::status(root, ec);
    return !m_cps.empty() || fail(root, fs::exists(status) && !fs::is_directory(status)
                                            ? "not a directory"
                                            : "no log files of the service are in there");
}

void RecordedCard::find_sets(const std::string& log_root, std::vector<Set>* sets) {
    for (const std::string& name : names_in(log_root)) {
        const std::string path = log_root + "/" + name;
        if (is_set_name(name) && is_directory(path)) {
            sets->push_back({name, path});
        }
    }
}

void RecordedCard::read_set(const Set& set) {
    for (const std::string& name : names_in(set.path)) {
        const std::string path = set.path + "/" + name;
        bool modem;
        if (name != "agdsp" && !SimHandset::knows_cp(name, &modem)) {
            std::error_code ec;
            if (fs::is_directory(fs::symlink_status(path, ec))) {
                fail(path, "not the name of a co-processor");
            }
            continue;
        }
        if (!is_directory(path)) {
            continue;
        }
        auto cp = std::find_if(m_cps.begin(), m_cps.end(),
                               [&](const RecordedCp& c) { return c.name == name; });
        RecordedCp found{name, {}};
        RecordedCp& all = cp == m_cps.end() ? found : *cp;
        read_cp(path, &all);
        if (cp == m_cps.end() && !found.files.empty()) {
            m_cps.push_back(std::move(found));
        }
    }
}

void RecordedCard::read_cp(const std::string& dir, RecordedCp* cp) {
    for (const std::string& name : names_in(dir)) {
        RecordedFile file;
        file.path = dir + "/" + name;
        file.set = m_sets;
        if (!parse_log_name(name, cp->name, &file)) {
            ++m_other_files;
        } else if (read_file(cp->name, &file)) {
            cp->files.push_back(std::move(file));
        }
    }
}

bool RecordedCard::read_file(const std::string& cp, RecordedFile* file) {
    // A FIFO of this name must not make anybody wait.
    const int fd = open(file->path.c_str(), O_RDONLY | O_NONBLOCK | O_NOFOLLOW | O_CLOEXEC);
    struct stat st = {};
    if (fd < 0 || fstat(fd, &st) != 0) {
        const int error = errno;
        if (fd >= 0) {
            close(fd);
        }
        return fail(file->path, error == ELOOP ? "a link, not followed" : strerror(error));
    }
    uint8_t head[StreamCheck::RECORD_SIZE];
    const bool regular = S_ISREG(st.st_mode);
    const ssize_t n = regular ? pread(fd, head, sizeof head, 0) : 0;
    const int error = errno;
    close(fd);
    if (!regular || n < 0) {
        return fail(file->path, regular ? strerror(error) : "no regular file");
    }
    bool modem = false;
    SimHandset::knows_cp(cp, &modem);
    file->size = static_cast<uint64_t>(st.st_size);
    if (n == static_cast<ssize_t>(sizeof head) && (modem || !m_clean) &&
        memcmp(head, RECORD_MAGIC, sizeof RECORD_MAGIC) == 0) {
        file->head = sizeof head;
        file->size -= sizeof head;
    }
    return true;
}
