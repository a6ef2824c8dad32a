#include "storage/CpDirectory.h"

#include <dirent.h>
#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>

#include <algorithm>
#include <vector>

#include "core/log.h"
#include "storage/CpSetDirectory.h"
#include "storage/LogFile.h"
#include "storage/log_name.h"
#include "storage/paths.h"

CpDirectory::CpDirectory(CpSetDirectory* set, const android::String8& name)
    : m_set(set), m_name(name), m_path(set->path()) {
    m_path.append("/");
    m_path.append(name);
}

CpDirectory::~CpDirectory() {
    for (LogFile* file : m_files) {
        delete file;
    }
}

int CpDirectory::create() {
    return make_log_dir(m_path);
}

int CpDirectory::remove() {
    return remove_tree(m_path);
}

int CpDirectory::stat() {
    DIR* dir = opendir(m_path.string());
    if (!dir) {
        return -1;
    }
    std::vector<LogFile*> found;
    while (const struct dirent* entry = readdir(dir)) {
        if (!strcmp(entry->d_name, ".") || !strcmp(entry->d_name, "..")) {
            continue;
        }
        // Links are not followed: one on a card must not lead trimming out of the tree.
        struct stat st;
        if (fstatat(dirfd(dir), entry->d_name, &st, AT_SYMLINK_NOFOLLOW) < 0 ||
            !S_ISREG(st.st_mode)) {
            continue;
        }
        LogFile* file = new LogFile(android::String8(entry->d_name), this, LT_UNKNOWN,
                                    static_cast<uint32_t>(st.st_size));
        file->parse_name();
        found.push_back(file);
        m_size += static_cast<uint64_t>(st.st_size);
    }
    closedir(dir);
    insert_scanned(found.data(), found.size());
    return 0;
}

// Puts a scan's files into the list order. They are sorted first, so that a directory
// of many thousand files costs n log n comparisons instead of n walks along the list.
void CpDirectory::insert_scanned(LogFile** files, size_t num) {
    // Where a kind stands: unknown files lead, version records end the list.
    auto group = [](const LogFile* file) {
        return file->type() == LT_UNKNOWN ? 0 : file->type() == LT_VERSION ? 2 : 1;
    };
    // Of log files made within one second the one with the larger number is older. Other
    // files count as number 0, so that the order stays a strict one among mixed kinds.
    auto number = [](const LogFile* file) {
        uint32_t value = 0;
        size_t digits;
        return file->type() == LT_LOG && parse_log_number(file->name(), value, digits) == 0 ? value
                                                                                            : 0;
    };
    std::stable_sort(files, files + num, [&](const LogFile* a, const LogFile* b) {
        if (group(a) != group(b)) {
            return group(a) < group(b);
        }
        if (group(a) != 1) {
            return false;
        }
        if (a->time() < b->time() || b->time() < a->time()) {
            return a->time() < b->time();
        }
        return number(a) > number(b);
    });
    // Unknown files each go ahead of those found before.
    std::reverse(files, std::find_if(files, files + num,
                                     [&](const LogFile* file) { return group(file) != 0; }));
    for (size_t i = 0; i < num; ++i) {
        m_files.push_back(files[i]);
    }
}

CpDirectory::FileIter CpDirectory::find(LogFile* file) {
    FileIter it = m_files.begin();
    while (it != m_files.end() && *it != file) {
        ++it;
    }
    return it;
}

// Takes a file out of the list and deletes its object, which clears every reference
// to it, the marks of this directory included. Returns the next list position.
CpDirectory::FileIter CpDirectory::drop(FileIter it) {
    LogFile* file = *it;
    FileIter next = m_files.erase(it);
    delete file;
    return next;
}

LogFile* CpDirectory::create_log_file() {
    struct tm t;
    if (get_local_time(t) < 0) {
        return nullptr;
    }
    const LogTime time = LogTime::from_tm(t);
    const android::String8 name = android::String8::format(
        "0-%s-%04d-%02d-%02d_%02d-%02d-%02d.log", m_name.string(), time.year, time.month, time.day,
        time.hour, time.minute, time.second);
    // A file of this second that could not be renumbered still has the name: writing on
    // would overwrite it.
    if (find(name)) {
        errno = EEXIST;
        err_log("log file %s exists already", name.string());
        return nullptr;
    }
    LogFile* file = new LogFile(name, this, t);
    if (file->open() < 0) {
        delete file;
        return nullptr;
    }
    bool first = true;
    for (const LogFile* listed : m_files) {
        first = first && listed->type() != LT_LOG;
    }
    if (first) {
        m_first_log = file;
    }
    m_files.push_back(file);
    m_cur_log = file;
    return file;
}

LogFile* CpDirectory::find(const android::String8& name) const {
    for (LogFile* file : m_files) {
        if (file->name() == name) {
            return file;
        }
    }
    return nullptr;
}

// Gives a file a name that no other one wants, "-N" before its extension. 0 or -1. One that
// is gone from the medium is dropped.
int CpDirectory::set_aside(LogFile* file) {
    const android::String8& name = file->name();
    const char* dot = strrchr(name.string(), '.');
    const size_t stem_len = dot ? static_cast<size_t>(dot - name.string()) : name.length();
    android::String8 aside;
    do {
        aside.setTo(name.string(), stem_len);
        aside.appendFormat("-%u%s", ++m_aside_num, name.string() + stem_len);
    } while (find(aside));
    if (file->rename_to(m_path, aside) < 0) {
        if (errno == ENOENT) {
            return remove_file(file);  // somebody deleted it: nothing is in the way
        }
        err_log("set aside %s failed", name.string());
        return -1;
    }
    return 0;
}

LogFile* CpDirectory::create_file(const android::String8& name, LogType type) {
    LogFile* older = find(name);
    if (older && set_aside(older) < 0) {
        return nullptr;
    }
    LogFile* file = new LogFile(name, this, type, 0);
    if (file->open() < 0) {
        delete file;
        return nullptr;
    }
    m_files.push_back(file);
    return file;
}

int CpDirectory::remove_file(LogFile* file) {
    FileIter it = find(file);
    if (it == m_files.end()) {
        return -1;
    }
    // Closed first: what is still staged counts in the size that goes.
    file->close();
    file->remove(m_path);
    dec_size(file->size());
    drop(it);
    return 0;
}

void CpDirectory::file_removed(LogFile* file) {
    FileIter it = find(file);
    if (it == m_files.end()) {
        err_log("log %s does not exist in dir %s", file->name().string(), m_name.string());
        return;
    }
    m_size -= file->size();
    drop(it);
}

void CpDirectory::close_log_file() {
    if (m_cur_log) {
        m_cur_log->close();
        m_cur_log = nullptr;
    }
}

void CpDirectory::rotate_logs() {
    // A file that could not be renumbered keeps its name. A younger one of the same second
    // would take that very name and so replace it on the medium: it stays as well.
    const LogFile* stuck = nullptr;
    for (LogFile* file : m_files) {
        if (file->type() != LT_LOG) {
            continue;
        }
        if (stuck && file->next_name() == stuck->name()) {
            err_log("%s is in the way of %s", stuck->name().string(), file->name().string());
            stuck = file;
        } else if (file->rotate(m_path) < 0) {
            stuck = file;
        }
    }
}

void CpDirectory::add_size(uint32_t num) {
    m_size += num;
    m_set->add_size(num);
}

void CpDirectory::dec_size(uint32_t num) {
    m_size -= num;
    m_set->dec_size(num);
}

uint64_t CpDirectory::trim(uint64_t wanted) {
    uint64_t removed = 0;
    while (!m_files.empty()) {
        FileIter it = m_files.begin();
        LogFile* file = *it;
        if (file->remove(m_path) < 0) {
            err_log("delete %s error", file->name().string());
            break;
        }
        const uint64_t size = file->size();
        drop(it);
        removed += size;
        if (size >= wanted) {
            break;
        }
        wanted -= size;
    }
    m_size -= removed;
    return removed;
}

bool CpDirectory::is_protected(const LogFile* file) const {
    return file == m_first_log.get() || file == m_cur_log.get() || file->type() == LT_VERSION ||
           file->type() == LT_WCDMA_IQ;
}

uint64_t CpDirectory::trim_working_dir(uint64_t wanted) {
    uint64_t removed = 0;
    FileIter it = m_files.begin();
    while (it != m_files.end()) {
        LogFile* file = *it;
        if (is_protected(file)) {
            ++it;
            continue;
        }
        if (file->remove(m_path) < 0) {
            err_log("delete %s error", file->name().string());
            break;
        }
        const uint64_t size = file->size();
        it = drop(it);
        removed += size;
        if (size >= wanted) {
            break;
        }
        wanted -= size;
    }
    m_size -= removed;
    renumber_first_log();
    return removed;
}

// Keeps the numbers contiguous: the first log file follows on the oldest one left.
void CpDirectory::renumber_first_log() {
    if (!m_first_log) {
        return;
    }
    for (LogFile* file : m_files) {
        if (file->type() != LT_LOG || file == m_first_log.get()) {
            continue;
        }
        uint32_t number;
        size_t digits;
        if (parse_log_number(file->name(), number, digits) == 0 && number != UINT32_MAX) {
            m_first_log->change_name_num(number + 1);
        }
        return;
    }
}
