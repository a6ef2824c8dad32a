// SPDX-License-Identifier: Apache-2.0

#include "storage/CpDirectory.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>

#include <memory>
#include <utility>

#include "core/SavedErrno.h"
#include "core/list_find.h"
#include "core/log.h"
#include "storage/CpSetDirectory.h"
#include "storage/LogFile.h"
#include "storage/MediaStorage.h"
#include "storage/log_name.h"
#include "storage/paths.h"

namespace {

constexpr int MAX_NAMES = 100;  // that are tried for a new file

}  // namespace

CpDirectory::CpDirectory(CpSetDirectory* set, const android::String8& name)
    : m_set(set), m_name(name), m_path(set->path()) {
    m_path.append("/");
    m_path.append(name);
}

CpDirectory::~CpDirectory() {
    // The totals above no longer count this directory: a file that cannot write out what is
    // staged as it closes must not subtract it there a second time.
    m_set = nullptr;
    for (LogFile* file : m_files) {
        delete file;
    }
}

int CpDirectory::create() {
    m_left_out = true;  // it may have been there all the time
    return make_log_dir(m_path);
}

int CpDirectory::remove() {
    return remove_tree(m_path);
}

// Takes a file that is gone from the medium out of the list and deletes its object, which
// clears every reference to it, the marks of this directory included. Returns the next list
// position.
CpDirectory::FileIter CpDirectory::drop(FileIter it) {
    LogFile* file = *it;
    FileIter next = m_files.erase(it);
    file->forget_staged();
    delete file;
    return next;
}

LogFile* CpDirectory::create_log_file() {
    struct tm t;
    if (get_local_time(t) < 0) {
        errno = 0;  // nothing is wrong with the medium
        return nullptr;
    }
    const android::String8 name = android::String8::format(
        "0-%s-%s.log", m_name.string(), LogTime::from_tm(t).file_stamp().string());
    LogFile* file = open_and_list(std::make_unique<LogFile>(free_name(name), this, t), name);
    if (!file) {
        return nullptr;
    }
    bool first = true;
    for (const LogFile* listed : m_files) {
        first = first && (listed == file || listed->type() != LT_LOG);
    }
    if (first) {
        m_first_log = file;
    }
    m_cur_log = file;
    return file;
}

// Opens the new file and puts it at the end of the list. Null with errno when it cannot be opened.
LogFile* CpDirectory::open_and_list(std::unique_ptr<LogFile> file, const android::String8& wanted) {
    for (int tries = 1; file->open(O_EXCL) < 0; ++tries) {
        if (errno != EEXIST || tries == MAX_NAMES) {
            const SavedErrno keep;
            file.reset();
            return nullptr;
        }
        file->set_name(aside_name(wanted));  // a directory that could not be looked at has it
    }
    m_files.push_back(file.get());
    return file.release();
}

LogFile* CpDirectory::find(const android::String8& name) const {
    return find_named(m_files, &LogFile::name, name);
}

// A name that is free in the directory: the given one with "-N" before its extension. Of a
// broken medium, which says of every name that it is taken, the last one that was tried.
android::String8 CpDirectory::aside_name(const android::String8& name) {
    const char* dot = strrchr(name.string(), '.');
    const size_t stem_len = dot ? static_cast<size_t>(dot - name.string()) : name.length();
    android::String8 aside;
    struct stat st;
    for (int tries = 0; tries < MAX_NAMES; ++tries) {
        aside.setTo(name.string(), stem_len);
        aside.appendFormat("-%u%s", ++m_aside_num, name.string() + stem_len);
        if (!find(aside) && lstat(JoinedPath(m_path, aside).string(), &st) < 0) {
            break;
        }
    }
    return aside;
}

// Makes sure that a new file overwrites nothing: renames whatever has the name on the medium.
// Returns the name for the new file, a different one only when the older file cannot be looked
// at or renamed.
android::String8 CpDirectory::free_name(const android::String8& name) {
    LogFile* older = find(name);
    const JoinedPath path(m_path, name);
    struct stat st;
    if (lstat(path.string(), &st) < 0) {
        if (!means_vanished(errno)) {
            return aside_name(name);  // something may be there
        }
        if (older) {
            remove_file(older);  // somebody deleted it
        }
        return name;
    }
    const android::String8 aside = aside_name(name);
    const int moved = older
                          ? older->rename_to(m_path, aside)
                          : rename_to_free_name(path.string(), JoinedPath(m_path, aside).string());
    if (moved < 0) {
        err_log("set aside %s failed", name.string());
        return aside;
    }
    if (!older && S_ISREG(st.st_mode)) {
        // From now on it counts, and may be trimmed.
        LogFile* found = new LogFile(aside, this, LT_UNKNOWN, 0);
        found->parse_name();
        found->found(static_cast<uint64_t>(st.st_size));
        m_files.push_back(found);
        add_size(found->counted());
    }
    return name;
}

LogFile* CpDirectory::create_file(const android::String8& name, LogType type) {
    return open_and_list(std::make_unique<LogFile>(free_name(name), this, type, 0), name);
}

// Whether this directory, its set or what holds the sets has become a symbolic link: what is
// behind it is somebody else's.
bool CpDirectory::leads_away() const {
    return is_link(m_path) || is_link(m_set->path()) || m_set->media()->leads_away();
}

int CpDirectory::remove_file(LogFile* file) {
    FileIter it = find_object(m_files, file);
    if (it == m_files.end()) {
        return -1;
    }
    const SavedErrno keep;
    if (!leads_away()) {
        file->remove(m_path);
    }
    dec_size(file->counted());
    drop(it);
    return 0;
}

void CpDirectory::file_removed(LogFile* file) {
    FileIter it = find_object(m_files, file);
    if (it == m_files.end()) {
        err_log("log %s does not exist in dir %s", file->name().string(), m_name.string());
        return;
    }
    m_size -= file->counted();
    m_set->media()->totals_uncertain();
    drop(it);
}

void CpDirectory::close_log_file() {
    if (m_cur_log) {
        m_cur_log->close();
        m_cur_log = nullptr;
    }
}

void CpDirectory::add_size(uint64_t num) {
    m_size += num;
    m_set->add_size(num);
}

void CpDirectory::dec_size(uint64_t num) {
    m_size -= num;
    if (m_set) {
        m_set->dec_size(num);
    }
}

uint64_t CpDirectory::trim(uint64_t wanted) {
    const LogFile* stuck = nullptr;
    const uint64_t removed = delete_oldest(wanted, Spare::NOTHING, stuck);
    if (stuck) {
        err_log("delete %s error", stuck->name().string());
    }
    m_size -= removed;
    return removed;
}

// Deletes files from the front, but for those that spare names, until the bytes wanted are gone: at
// least one, if there is one. Ends at the first that can not be deleted, stuck, with its errno.
// Returns the bytes removed; the sizes stay.
uint64_t CpDirectory::delete_oldest(uint64_t wanted, Spare spare, const LogFile*& stuck) {
    uint64_t removed = 0;
    if (is_link(m_path)) {
        return removed;
    }
    FileIter it = m_files.begin();
    while (it != m_files.end()) {
        LogFile* file = *it;
        if (is_spared(file, spare)) {
            ++it;
            continue;
        }
        if (file->remove(m_path) < 0) {
            stuck = file;
            m_set->media()->deletion_failed(errno);
            break;
        }
        const uint64_t size = file->counted();
        it = drop(it);
        removed += size;
        if (size >= wanted) {
            break;
        }
        wanted -= size;
    }
    return removed;
}

uint64_t CpDirectory::trim_past_stuck(uint64_t wanted, Spare spare) {
    MediaStorage* const media = m_set->media();
    uint64_t removed = 0;
    FileIter it = is_link(m_path) ? m_files.end() : m_files.begin();
    while (it != m_files.end() && removed < wanted && media->may_pass_over()) {
        LogFile* file = *it;
        if (file->stuck() || is_spared(file, spare)) {
            ++it;
        } else if (file->remove(m_path) < 0) {
            media->passed_over(errno);
            ++it;
        } else {
            removed += file->counted();
            it = drop(it);
        }
    }
    m_size -= removed;
    if (spare != Spare::NOTHING) {
        renumber_first_log();
    }
    return removed;
}

bool CpDirectory::is_spared(const LogFile* file, Spare spare) const {
    const bool kept_type = spare == Spare::PROTECTED
                               ? file->type() == LT_VERSION || file->type() == LT_WCDMA_IQ
                               : file->type() != LT_LOG;
    return spare != Spare::NOTHING &&
           (kept_type || file == m_first_log.get() || file == m_cur_log.get());
}

uint64_t CpDirectory::trim_working_dir(uint64_t wanted) {
    const LogFile* stuck = nullptr;
    const uint64_t removed = delete_oldest(wanted, Spare::PROTECTED, stuck);
    if (stuck) {
        err_log("delete %s error", stuck->name().string());
    }
    m_size -= removed;
    renumber_first_log();
    return removed;
}

uint64_t CpDirectory::trim_logs(uint64_t wanted) {
    const LogFile* stuck = nullptr;
    const uint64_t removed = delete_oldest(wanted, Spare::ALL_BUT_LOGS, stuck);
    if (stuck) {
        err_log("delete %s error", stuck->name().string());
    }
    m_size -= removed;
    renumber_first_log();
    return removed;
}
