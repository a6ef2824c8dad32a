// SPDX-License-Identifier: Apache-2.0

#include "storage/MediaStorage.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <memory>
#include <utility>
#include <vector>

#include "core/list_find.h"
#include "core/log.h"
#include "core/system_paths.h"
#include "storage/CpSetDirectory.h"
#include "storage/StorageManager.h"
#include "storage/dir_entries.h"
#include "storage/log_name.h"
#include "storage/paths.h"

MediaStorage::MediaStorage(StorageManager* manager) : m_manager(manager) {}

MediaStorage::~MediaStorage() {
    forget_sets();
}

void MediaStorage::set_dirs(const android::String8& top_dir, Links root_links) {
    m_root_links = root_links;
    m_top_dir = top_dir;
    m_log_root = top_dir;
    m_log_root.append(DIR_MODEM_LOG);
}

void MediaStorage::forget_sets() {
    m_working_set = nullptr;
    for (CpSetDirectory* set : m_sets) {
        delete set;
    }
    m_sets.clear();
    m_size = 0;
    m_vain_trims = 0;
}

// The kest directory belongs to another service, which may not have made it yet.
int MediaStorage::prepare_top_dir() const {
    if (!m_manager->kest_layout() ||
        (access(m_top_dir.string(), F_OK) == 0 && !is_link(m_top_dir))) {
        return 0;
    }
    return make_log_dir(m_top_dir);
}

bool MediaStorage::leads_away() const {
    return (m_root_links == Links::REFUSE && is_link(m_log_root)) ||
           (m_manager->kest_layout() && is_link(m_top_dir));
}

int MediaStorage::stat() {
    if (prepare_top_dir() < 0 || make_log_dir(m_log_root, m_root_links) < 0 || scan_sets() < 0) {
        return -1;
    }
    m_scanned = true;
    return 0;
}

// Adds the sets found in the log root to those that are listed already.
int MediaStorage::scan_sets() {
    std::vector<std::unique_ptr<CpSetDirectory>> found;
    const int result = for_each_entry(m_log_root, [&](const char* name, const struct stat& st) {
        if (!S_ISDIR(st.st_mode)) {
            return;
        }
        auto set = std::make_unique<CpSetDirectory>(
            this, android::String8(JoinedPath(m_log_root, android::String8(name)).string()));
        if (set->stat() == 0) {
            found.push_back(std::move(set));
        }
    });
    // One that is listed already (it was started before the medium was scanned) stays as it is.
    // The list is not in order where the clock was set back between two sets.
    found.erase(std::remove_if(found.begin(), found.end(),
                               [this](const auto& set) {
                                   return find_named(m_sets, &CpSetDirectory::path, set->path());
                               }),
                found.end());
    // Ascending order: each insertion finds its place at the end of the list at once.
    std::sort(found.begin(), found.end(), [](const auto& a, const auto& b) {
        return strcmp(a->path().string(), b->path().string()) < 0;
    });
    for (std::unique_ptr<CpSetDirectory>& set : found) {
        insert_scanned(std::move(set));
    }
    return result < 0 ? -1 : 0;
}

// Puts a scanned set in front of the first one whose path compares greater.
void MediaStorage::insert_scanned(std::unique_ptr<CpSetDirectory> set) {
    android::List<CpSetDirectory*>::iterator it = m_sets.end();
    while (it != m_sets.begin()) {
        android::List<CpSetDirectory*>::iterator before = it;
        --before;
        if (strcmp((*before)->path().string(), set->path().string()) < 0) {
            break;
        }
        it = before;
    }
    m_size += set->size();
    m_sets.insert(it, set.release());
}

CpSetDirectory* MediaStorage::create_cp_set() {
    struct tm t;
    if (get_local_time(t) < 0) {
        errno = 0;  // nothing is wrong with the medium
        return nullptr;
    }
    android::String8 path(m_log_root);
    path.appendFormat("/%s", LogTime::from_tm(t).set_stamp().string());
    if (leads_away() || (make_log_dir(path) < 0 &&
                         (errno != ENOENT || remake_log_root() < 0 || make_log_dir(path) < 0))) {
        err_log("create CP set %s failed", path.string());
        return nullptr;
    }
    CpSetDirectory* set = find_named(m_sets, &CpSetDirectory::path, path);
    if (!set) {
        set = new CpSetDirectory(this, path);
        // Normally the directory is new and empty. One that existed, unlisted, is taken over
        // with what it holds, so that everything in it is counted.
        set->stat();
        m_size += set->size();
        m_sets.push_back(set);
    }
    m_working_set = set;
    m_vain_trims = 0;  // what was spared may go now
    return set;
}

// Somebody deleted the whole log root, or the card is another one: starts over.
int MediaStorage::remake_log_root() {
    m_manager->media_vanished(this);
    forget_sets();
    m_rescan = true;  // it may have been there all the time
    return prepare_top_dir() < 0 ? -1 : make_log_dir(m_log_root, m_root_links);
}

CpSetDirectory* MediaStorage::prepare_cur_set() {
    if (prepare_top_dir() < 0) {
        err_log("create parent dir error");
        return nullptr;
    }
    if (!dir_usable(m_log_root, m_root_links)) {
        m_manager->media_vanished(this);
        forget_sets();
        m_rescan = true;
        if (make_log_dir(m_log_root, m_root_links) < 0) {
            err_log("create top dir error");
            return nullptr;
        }
    }
    if (m_working_set && !dir_usable(m_working_set->path())) {
        m_manager->media_vanished(this);
        drop_working_set();
    }
    CpSetDirectory* set = m_working_set ? m_working_set : start_set();
    if (set && m_rescan) {
        // The log root may have been there all the time: what it holds counts.
        m_rescan = scan_sets() < 0;
    }
    return set;
}

void MediaStorage::drop_working_set() {
    CpSetDirectory* vanished = m_working_set;
    m_working_set = nullptr;
    m_sets.erase(find_object(m_sets, vanished));
    m_size -= vanished->size();
    delete vanished;
    // The card may be another one: what it holds counts, what the old one held does not.
    m_rescan = true;
    totals_uncertain();
}

LogFile* MediaStorage::create_file(const android::String8& cp_name, LogType type, bool& new_dir,
                                   const android::String8& name) {
    CpSetDirectory* set = prepare_cur_set();
    if (!set) {
        return nullptr;
    }
    return type == LT_LOG ? set->create_log_file(cp_name, new_dir)
                          : set->create_file(cp_name, name, type);
}

CpDirectory* MediaStorage::get_cp_dir(const android::String8& cp_name) const {
    return m_working_set ? m_working_set->get_cp_dir(cp_name) : nullptr;
}

bool MediaStorage::can_make_files() {
    if (prepare_top_dir() < 0 || make_log_dir(m_log_root, m_root_links) < 0) {
        return false;
    }
    const JoinedPath probe(m_log_root, android::String8(NAME_WRITE_TEST));
    if (remove(probe.string()) < 0 && errno == ENOTEMPTY && !m_probe_cleared) {
        m_probe_cleared = true;  // a shell with every block would cost too much
        remove_tree(android::String8(probe.string()));
    }
    const int fd = open(probe.string(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644);
    if (fd < 0) {
        return errno == ENOSPC;
    }
    const bool good = write(fd, "", 1) == 1 || errno == ENOSPC;
    close(fd);
    return unlink(probe.string()) == 0 && good;
}

void MediaStorage::clear() {
    forget_sets();
    m_scanned = false;
    m_rescan = false;
    m_probe_cleared = false;
}

void MediaStorage::clear_all() {
    forget_sets();
    m_rescan = true;  // what could not be deleted, of a card that is out, say, still counts
    if (leads_away()) {
        err_log("%s is left alone", m_log_root.string());
        return;
    }
    const int status = remove_numbered_entries(m_log_root);
    if (status != 0) {
        info_log("not all logs in %s could be deleted, status %d", m_log_root.string(), status);
    }
}
