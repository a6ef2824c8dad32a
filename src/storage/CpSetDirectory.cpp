// SPDX-License-Identifier: Apache-2.0

#include "storage/CpSetDirectory.h"

#include <sys/stat.h>

#include <memory>

#include "core/SavedErrno.h"
#include "core/list_find.h"
#include "storage/CpDirectory.h"
#include "storage/MediaStorage.h"
#include "storage/dir_entries.h"
#include "storage/paths.h"

CpSetDirectory::CpSetDirectory(MediaStorage* media, const android::String8& path)
    : m_media(media), m_path(path) {}

CpSetDirectory::~CpSetDirectory() {
    for (CpDirectory* dir : m_dirs) {
        delete dir;
    }
}

int CpSetDirectory::create() {
    return make_log_dir(m_path);
}

int CpSetDirectory::remove() {
    return remove_tree(m_path);
}

int CpSetDirectory::stat() {
    bool all = true;
    const int result = for_each_entry(m_path, [&](const char* name, const struct stat& st) {
        if (!S_ISDIR(st.st_mode)) {
            return;
        }
        auto dir = std::make_unique<CpDirectory>(this, android::String8(name));
        if (dir->stat() == 0) {
            m_size += dir->size();
            m_dirs.push_back(dir.release());
        } else {
            all = false;
        }
    });
    m_left_out = !all || result != 0;
    return result < 0 ? -1 : 0;
}

bool CpSetDirectory::found_empty() {
    if (m_dirs.empty() && m_left_out && m_asked++ % ASKED_PER_SCAN == 0 && !is_link(m_path)) {
        stat();
        m_media->add_size(m_size);
    }
    return m_dirs.empty() && !m_left_out;
}

CpDirectory* CpSetDirectory::get_cp_dir(const android::String8& cp_name) const {
    return find_named(m_dirs, &CpDirectory::name, cp_name);
}

CpDirectory* CpSetDirectory::prepare_cp_dir(const android::String8& cp_name, bool& new_dir) {
    CpDirectory* listed = get_cp_dir(cp_name);
    if (listed && dir_usable(listed->path())) {
        return listed;
    }
    if (listed) {
        m_dirs.erase(find_object(m_dirs, listed));
        m_size -= listed->size();
        m_media->totals_uncertain();
        delete listed;
    }
    auto dir = std::make_unique<CpDirectory>(this, cp_name);
    if (dir->create() < 0) {
        const SavedErrno keep;
        dir.reset();
        return nullptr;
    }
    new_dir = true;
    m_dirs.push_back(dir.get());
    return dir.release();
}

LogFile* CpSetDirectory::create_file(const android::String8& cp_name, const android::String8& name,
                                     LogType type) {
    bool new_dir = false;
    CpDirectory* dir = prepare_cp_dir(cp_name, new_dir);
    return dir ? dir->create_file(name, type) : nullptr;
}

LogFile* CpSetDirectory::create_log_file(const android::String8& cp_name, bool& new_dir) {
    bool created = false;
    CpDirectory* dir = prepare_cp_dir(cp_name, created);
    LogFile* file = dir ? dir->create_log_file() : nullptr;
    if (file) {
        new_dir = created;
    }
    return file;
}

void CpSetDirectory::add_size(uint64_t num) {
    m_size += num;
    m_media->add_size(num);
}

void CpSetDirectory::dec_size(uint64_t num) {
    m_size -= num;
    m_media->dec_size(num);
}

size_t CpSetDirectory::recount() {
    size_t looked_at = 0;
    m_size = 0;
    android::List<CpDirectory*>::iterator it = m_dirs.begin();
    while (it != m_dirs.end()) {
        CpDirectory* dir = *it;
        looked_at += dir->recount();
        if (dir_usable(dir->path())) {
            m_size += dir->size();
            ++it;
        } else {
            it = m_dirs.erase(it);
            delete dir;
        }
    }
    return looked_at;
}

uint64_t CpSetDirectory::trim_with(Walk walk, uint64_t wanted, Spare spare) {
    uint64_t removed = 0;
    if (is_link(m_path)) {
        return removed;
    }
    android::List<CpDirectory*>::iterator it = m_dirs.begin();
    while (it != m_dirs.end()) {
        CpDirectory* dir = *it;
        dir->found_empty();  // what it finds is trimmed
        const uint64_t n = walk(dir, wanted, spare);
        removed += n;
        if (dir->found_empty()) {
            it = m_dirs.erase(it);
            dir->remove();
            delete dir;
        } else {
            ++it;
        }
        if (n >= wanted) {
            break;
        }
        wanted -= n;
    }
    m_size -= removed;
    return removed;
}

uint64_t CpSetDirectory::trim(uint64_t wanted) {
    return trim_working_dir(wanted, Spare::NOTHING);
}

uint64_t CpSetDirectory::trim_working_dir(uint64_t wanted, Spare spare) {
    return trim_with(
        [](CpDirectory* dir, uint64_t bytes, Spare left) {
            return left == Spare::NOTHING     ? dir->trim(bytes)
                   : left == Spare::PROTECTED ? dir->trim_working_dir(bytes)
                                              : dir->trim_logs(bytes);
        },
        wanted, spare);
}

uint64_t CpSetDirectory::trim_past_stuck(uint64_t wanted, Spare spare) {
    return trim_with([](CpDirectory* dir, uint64_t bytes,
                        Spare left) { return dir->trim_past_stuck(bytes, left); },
                     wanted, spare);
}
