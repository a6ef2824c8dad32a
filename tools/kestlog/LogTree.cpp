// SPDX-License-Identifier: Apache-2.0

#include "kestlog/LogTree.h"

#include <dirent.h>
#include <errno.h>
#include <fcntl.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>

#include "core/system_paths.h"
#include "kestlog/Archive.h"
#include "kestlog/LogReader.h"
#include "kestlog/OutputFile.h"

namespace {

bool is_dir(const std::string& path) {
    struct stat st;
    return stat(path.c_str(), &st) == 0 && S_ISDIR(st.st_mode);
}

bool is_link(const std::string& path) {
    struct stat st;
    return lstat(path.c_str(), &st) == 0 && S_ISLNK(st.st_mode);
}

std::string base_name(const std::string& path) {
    char* real = realpath(path.c_str(), nullptr);
    const std::string full = real ? real : path;
    free(real);
    return full.substr(full.rfind('/') + 1);
}

bool write_all(int fd, const char* data, ssize_t len) {
    while (len > 0) {
        const ssize_t n = write(fd, data, static_cast<size_t>(len));
        if (n < 0 && errno != EINTR) {
            return false;
        }
        data += std::max<ssize_t>(n, 0);
        len -= std::max<ssize_t>(n, 0);
    }
    return true;
}

// Standard input, whose first bytes are needed twice: what comes from a pipe is copied to a file
// without a name. Where it stands, or -1 with errno.
off_t rewindable_input() {
    const off_t start = lseek(STDIN_FILENO, 0, SEEK_CUR);
    const int copy = start < 0 ? TempDir::open_file() : -1;
    if (copy < 0) {
        return start;
    }
    bool good = true;
    std::vector<char> bytes(256 * 1024);
    for (ssize_t n; good && (n = read(STDIN_FILENO, bytes.data(), bytes.size())) != 0;) {
        good = n > 0 ? write_all(copy, bytes.data(), n) : errno == EINTR;
    }
    good = good && lseek(copy, 0, SEEK_SET) == 0 && dup2(copy, STDIN_FILENO) >= 0;
    const int error = errno;
    close(copy);
    errno = error;
    return good ? 0 : -1;
}

std::string without_slash(std::string path) {
    if (path.size() > 1 && path.back() == '/') {
        path.pop_back();
    }
    return path;
}

// The CP of that name in the set, which may be new.
TreeCp* cp_of(TreeSet* set, const std::string& name, const TreeDir& dir) {
    for (TreeCp& cp : set->cps) {
        if (cp.name == name) {
            return &cp;
        }
    }
    set->cps.push_back({name, &dir, {}});
    return &set->cps.back();
}

size_t count_entries(const std::string& path) {
    size_t count = 0;
    DIR* const dir = opendir(path.c_str());
    while (dir && readdir(dir)) {
        ++count;
    }
    if (dir) {
        closedir(dir);
    }
    return count;
}

}  // namespace

std::string TreeDir::name() const {
    const std::string text = without_slash(shown());
    return text.empty() ? "." : text;
}

std::string TreeSet::shown() const {
    const bool is_file = given && cps.size() == 1 && cps[0].files.size() == 1;
    return is_file ? cps[0].files[0].shown() : dir->name();
}

bool LogTree::visit_dir(const std::string& path, const std::function<void(const Entry&)>& visit) {
    DIR* dir = opendir(path.c_str());
    if (!dir) {
        failures.push_back(shown(path) + ": " + strerror(errno));
        return false;
    }
    uint64_t lost = 0;
    int lost_error = 0;
    // The end and a failure look the same but for errno.
    while (const struct dirent* entry = (errno = 0, readdir(dir))) {
        struct stat st;
        if (strcmp(entry->d_name, ".") == 0 || strcmp(entry->d_name, "..") == 0) {
            continue;
        }
        if (is_foreign_name(entry->d_name)) {
            foreign.push_back(shown(path) + "/" + entry->d_name);
        } else if (fstatat(dirfd(dir), entry->d_name, &st, AT_SYMLINK_NOFOLLOW) == 0) {
            visit({entry->d_name, S_ISDIR(st.st_mode), S_ISREG(st.st_mode),
                   static_cast<uint64_t>(st.st_size), modified_time(st)});
        } else if (errno != ENOENT) {  // else it has just been deleted
            ++lost;
            lost_error = errno;
        }
    }
    if (errno != 0) {
        failures.push_back(shown(path) + ": only in part: " + strerror(errno));
    }
    if (lost > 0) {
        failures.push_back(shown(path) + ": " + std::to_string(lost) +
                           " entries cannot be read: " + strerror(lost_error));
    }
    closedir(dir);
    return true;
}

std::vector<LogTree::Entry> LogTree::list_dir(const std::string& path) {
    std::vector<Entry> entries;
    visit_dir(path, [&entries](const Entry& entry) { entries.push_back(entry); });
    std::sort(entries.begin(), entries.end(),
              [](const Entry& a, const Entry& b) { return a.name < b.name; });
    return entries;
}

std::string LogTree::shown(const std::string& path) const {
    const std::string& prefix = m_alias.first;
    return !prefix.empty() && path.compare(0, prefix.size(), prefix) == 0
               ? m_alias.second + path.substr(prefix.size())
               : path;
}

const TreeDir* LogTree::top_dir(const std::string& path, const std::string& shown) {
    m_tops.push_back({path, shown, m_medium});
    m_dirs.push_back({&m_tops.back(), ""});
    return &m_dirs.back();
}

const TreeDir* LogTree::dir_below(const TreeDir& dir, const std::string& name) {
    m_dirs.push_back({dir.top, dir.below + name + "/"});
    return &m_dirs.back();
}

bool LogTree::first_visit(const std::string& path) {
    struct stat st;
    return stat(path.c_str(), &st) < 0 || m_visited.insert({st.st_dev, st.st_ino}).second;
}

bool LogTree::add(const std::string& path, Files files) {
    return add_as(base_name(path), path, files);
}

bool LogTree::add_as(const std::string& medium, const std::string& given, Files files) {
    // A slash at the end would be doubled in the paths below.
    const size_t last = given.find_last_not_of('/');
    const std::string path = last == std::string::npos ? given : given.substr(0, last + 1);
    struct stat st;
    m_medium = medium;
    if (path == "-" || (stat(path.c_str(), &st) == 0 && !S_ISDIR(st.st_mode))) {
        const bool both = path == "-" && files == FILES_TOO;
        const off_t start = both ? rewindable_input() : 0;
        if (start < 0) {
            failures.push_back("-: cannot be copied to " + TempDir::parent() + ": " +
                               strerror(errno));
            return false;
        }
        const auto to_start = [&] { return !both || lseek(STDIN_FILENO, start, SEEK_SET) >= 0; };
        // Where standard input cannot be a file, unpacking it shows what it is.
        const bool archive = (path == "-" && !both) || is_archive(path);
        const size_t told = failures.size();
        if (archive && to_start() && add_archive(path)) {
            return true;
        }
        // An archive about which something was told is no file.
        if (files == DIRECTORIES_ONLY || failures.size() > told || !to_start()) {
            return false;
        }
        add_file(path);
        return true;
    }
    m_alias = {};
    return add_media(path) || add_directory(path);
}

void LogTree::add_file(const std::string& path) {
    struct stat st = {};
    path == "-" ? fstat(STDIN_FILENO, &st) : stat(path.c_str(), &st);
    const size_t slash = path.rfind('/') + 1;
    const std::string dir = path.substr(0, slash);
    const FileName name(path.substr(slash));
    struct stat in_dir;
    if (!m_visited.insert({st.st_dev, st.st_ino}).second ||
        (name.exact && stat(dir.empty() ? "." : dir.c_str(), &in_dir) == 0 &&
         m_visited.count({in_dir.st_dev, in_dir.st_ino}) > 0)) {
        return;  // given already, as it is or with its directory
    }
    OutputFile::keep(path);
    const auto known =
        name.exact ? m_given.insert({{dir, name.cp()}, sets.size()}).first : m_given.end();
    const size_t index = known == m_given.end() ? sets.size() : known->second;
    if (index == sets.size()) {
        const TreeDir* const in = top_dir(dir, dir);
        sets.push_back({"", in, {}, {{name.cp(), in, {}}}});
        sets.back().given = true;
    }
    TreeCp& cp = sets[index].cps[0];
    cp.files.push_back({name, cp.dir, static_cast<uint64_t>(st.st_size), modified_time(st)});
}

bool LogTree::add_archive(const std::string& path) {
    const auto no_room = [&] {
        failures.push_back(path + ": cannot be unpacked in " + TempDir::parent() + ": " +
                           strerror(errno));
        return false;
    };
    if (!m_unpacked) {
        auto made = std::make_unique<TempDir>();
        if (!made->create()) {
            return no_room();
        }
        m_unpacked = std::move(made);
    }
    std::string dir = m_unpacked->path() + "/" + std::to_string(m_archives++);
    if (mkdir(dir.c_str(), 0700) < 0) {
        return no_room();
    }
    const Unpacked unpacked = unpack_archive(path, dir, m_unpack_limit);
    if (!unpacked.is_archive) {
        return false;
    }
    failures.insert(failures.end(), unpacked.failures.begin(), unpacked.failures.end());
    for (const std::string& entry : unpacked.strays) {
        // Elsewhere, as among a handset's devices, they do not matter.
        const std::string stray = std::string("/").append(entry);
        if (stray.find(DIR_MODEM_LOG "/") != std::string::npos) {
            strays.push_back(path + stray);
        }
    }
    m_alias = {dir, path};
    // It may have been packed together with the directories above it, which are no handsets.
    const size_t roots = m_roots;
    while (!add_media(dir) && !add_directory(dir)) {
        m_roots = roots;
        const std::vector<Entry> entries = list_dir(dir);
        if (entries.size() != 1 || !entries[0].dir) {
            return false;
        }
        dir += "/" + entries[0].name;
    }
    return true;
}

bool LogTree::add_card(const std::string& path) {
    m_card_given = true;
    const bool added =
        access(path.c_str(), F_OK) == 0 && add_as(MEDIUM_CARD, path, DIRECTORIES_ONLY);
    m_roots = 0;  // it is none of the handsets
    return added;
}

// What a handset's root or a medium's top directory holds. False when path is neither.
bool LogTree::add_media(const std::string& path) {
    // Further handsets have their names before those of their media.
    const std::string name = m_medium;
    const std::string handset = m_roots++ ? name + " " : "";
    const bool medium = add_medium(path, name);
    const bool internal =
        add_medium(path + PATH_DATA_PARTITION, handset + MEDIUM_INTERNAL, Links::FOLLOW);
    const bool card = !m_card_given && add_medium(path + CARD_IN_ROOT, handset + MEDIUM_CARD);
    return medium || internal || card;
}

bool LogTree::add_medium(const std::string& path, const std::string& name, Links links) {
    bool found = false;
    for (const char* below : {DIR_MODEM_LOG, DIR_KEST DIR_MODEM_LOG}) {
        if (!is_dir(path + below)) {
            continue;
        }
        m_medium = name;
        found = true;
        // On a card a link may lead anywhere; in a handset's data partition it is the platform's.
        const bool kest = below != std::string(DIR_MODEM_LOG);
        if ((kest && is_link(path + DIR_KEST)) ||
            ((kest || links == Links::REFUSE) && is_link(path + below))) {
            strays.push_back(shown(path) + below);
        } else {
            read_root(path + below);
        }
    }
    return found;
}

bool LogTree::add_directory(const std::string& path) {
    // The directory's own name shows what it is or, in a renamed copy, the names inside it.
    const std::string name = base_name(path);
    LogTime time;
    bool any_set = false;
    bool any_cp = false;
    bool any_file = false;
    const size_t foreign_before = foreign.size();
    const size_t failures_before = failures.size();
    const bool readable = visit_dir(path, [&](const Entry& entry) {
        any_set |= entry.dir && parse_set_name(entry.name, &time);
        any_cp |= entry.dir && cp_type_of(entry.name) != CT_UNKNOWN;
        any_file |= entry.file && (any_file || FileName(entry.name).type != LT_UNKNOWN);
    });
    if (!readable) {
        return false;
    }
    const bool is_root = name == &DIR_MODEM_LOG[1] || any_set;
    const bool is_set = parse_set_name(name, &time) || any_cp;
    const bool is_cp = cp_type_of(name) != CT_UNKNOWN || any_file;
    // The directory is read again below.
    foreign.resize(foreign_before);
    if (!is_root && !is_set && !is_cp) {
        return false;
    }
    failures.resize(failures_before);
    if (is_root) {
        read_root(path);
        return true;
    }
    const TreeDir& dir = *top_dir(path + "/", shown(path) + "/");
    if (is_set) {
        read_set(dir, name);
    } else {
        sets.push_back({"", &dir, {}, {}});
        read_cp(dir, name, &sets.back());
        if (sets.back().cps.empty()) {  // it was read before
            sets.pop_back();
        }
    }
    return true;
}

void LogTree::read_root(const std::string& path) {
    if (!first_visit(path)) {
        return;
    }
    const TreeDir* const dir = top_dir(path + "/", shown(path) + "/");
    for (const Entry& entry : list_dir(path)) {
        LogTime time;
        if (entry.dir && parse_set_name(entry.name, &time)) {
            read_set(*dir_below(*dir, entry.name), entry.name);
        } else if (entry.file && (entry.name == DATABASE_NAME || entry.name == DIGEST_NAME)) {
            root_files.push_back({FileName(entry.name), dir, entry.size, entry.modified});
        } else if (!entry.file || entry.name != NAME_WRITE_TEST) {  // one that a kill left behind
            strays.push_back(dir->shown() + entry.name);
        }
    }
}

void LogTree::read_set(const TreeDir& dir, const std::string& name) {
    if (!first_visit(dir.path())) {
        return;
    }
    sets.push_back({name, &dir, {}, {}});
    parse_set_name(name, &sets.back().time);
    for (const Entry& entry : list_dir(without_slash(dir.path()))) {
        if (entry.dir && cp_type_of(entry.name) != CT_UNKNOWN) {
            read_cp(*dir_below(dir, entry.name), entry.name, &sets.back());
        } else {
            strays.push_back(dir.shown() + entry.name);
        }
    }
}

void LogTree::read_cp(const TreeDir& dir, const std::string& name, TreeSet* set) {
    const std::string path = without_slash(dir.path());
    if (!first_visit(path)) {
        return;
    }
    const bool renamed = cp_type_of(name) == CT_UNKNOWN;
    const size_t strays_before = strays.size();
    TreeCp* cp = renamed ? nullptr : cp_of(set, name, dir);
    if (cp) {
        // A list that grows takes its space twice.
        cp->files.reserve(cp->files.size() + count_entries(path));
    }
    visit_dir(path, [&](const Entry& entry) {
        if (!entry.file) {
            strays.push_back(dir.shown() + entry.name);
            return;
        }
        const FileName file(entry.name);
        if (renamed) {
            cp = cp_of(set, file.cp().empty() ? name : file.cp(), dir);
        }
        cp->files.push_back({file, &dir, entry.size, entry.modified});
    });
    std::sort(strays.begin() + static_cast<ptrdiff_t>(strays_before), strays.end());
    if (renamed) {
        std::sort(set->cps.begin(), set->cps.end(),
                  [](const TreeCp& a, const TreeCp& b) { return a.name < b.name; });
    }
}
