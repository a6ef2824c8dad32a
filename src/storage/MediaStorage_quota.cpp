// SPDX-License-Identifier: Apache-2.0
// The part of MediaStorage that keeps the medium within its limits.
#include <errno.h>

#include <algorithm>

#include "core/list_find.h"
#include "core/log.h"
#include "storage/CpSetDirectory.h"
#include "storage/MediaStorage.h"
#include "storage/StorageManager.h"
#include "storage/paths.h"

namespace {

// A medium that stays above its quota is counted again at the first failing check and then at
// one in this many, or in more where there are many files: somebody may delete files at any time,
// but counting looks at every file, and a check is made for every block.
constexpr size_t CHECKS_PER_RECOUNT = 16;
constexpr size_t FILES_PER_CHECK = 32;

}  // namespace

uint64_t MediaStorage::trim(uint64_t wanted) {
    const uint64_t removed = trim_sets_before(wanted);
    return removed + trim_working_set(wanted - std::min(wanted, removed), Spare::PROTECTED);
}

// For every block that is refused: after a trim that came across nothing but files that cannot be
// deleted, as many times are left out, so that a block costs one such file and not all.
uint64_t MediaStorage::trim_unless_vain(uint64_t wanted) {
    if (m_vain_trims > 0) {
        --m_vain_trims;
        return 0;
    }
    const uint64_t removed = trim(wanted);
    if (removed == 0 && m_stuck > 0) {
        m_vain_trims = m_stuck - 1;
    }
    return removed;
}

// A walk through the older sets leaves what is behind a file that cannot be deleted. That goes
// after them, but before anything in the working set.
uint64_t MediaStorage::trim_sets_before(uint64_t wanted) {
    m_stuck = 0;
    m_passed_over = 0;
    m_deletion_error = 0;
    if (leads_away()) {
        return 0;
    }
    uint64_t removed = trim_sets(wanted, &CpSetDirectory::trim_working_dir);
    if (removed < wanted && m_stuck > 0) {
        removed += trim_sets(wanted - removed, &CpSetDirectory::trim_past_stuck);
    }
    return removed;
}

uint64_t MediaStorage::trim_sets(uint64_t wanted,
                                 uint64_t (CpSetDirectory::*walk)(uint64_t, Spare)) {
    uint64_t removed = 0;
    android::List<CpSetDirectory*>::iterator it = m_sets.begin();
    while (it != m_sets.end()) {
        CpSetDirectory* set = *it;
        if (set == m_working_set) {
            ++it;
            continue;
        }
        set->found_empty();  // what it finds is trimmed
        const uint64_t n = (set->*walk)(wanted, Spare::NOTHING);
        removed += n;
        if (set->found_empty()) {
            it = m_sets.erase(it);
            set->remove();
            delete set;
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

uint64_t MediaStorage::trim_working_set(uint64_t wanted, Spare spare) {
    if (wanted == 0 || !m_working_set || leads_away()) {
        return 0;
    }
    const size_t stuck = m_stuck;
    uint64_t removed = m_working_set->trim_working_dir(wanted, spare);
    if (removed < wanted && m_stuck > stuck) {
        removed += m_working_set->trim_past_stuck(wanted - removed, spare);
    }
    m_size -= removed;
    return removed;
}

void MediaStorage::deletion_failed(int error) {
    ++m_stuck;
    // Other reasons, such as rights, tell of the file only.
    if (error == EIO || error == EROFS) {
        m_deletion_error = error;
    }
    if (error == EISDIR) {
        m_uncertain = true;  // counting again drops what is no file
    }
}

void MediaStorage::passed_over(int error) {
    ++m_passed_over;
    deletion_failed(error);
}

bool MediaStorage::above_quota() const {
    return m_quota != 0 && m_size > m_quota;
}

void MediaStorage::trim_old_sets() {
    recount_if_uncertain();
    if (above_quota() && m_overwrite) {
        trim_sets_before(m_size - m_quota);
    }
}

void MediaStorage::recount_if_uncertain() {
    if (above_quota() && m_uncertain) {
        recount();
    }
}

int MediaStorage::check_quota() {
    recount_if_uncertain();
    if (above_quota() && m_overwrite) {
        info_log("data large: %u/%uM", static_cast<unsigned int>(m_size),
                 static_cast<unsigned int>(m_quota >> 20));
        trim_unless_vain(m_size - m_quota);
    }
    if (above_quota() && !recount_helps()) {
        return -1;
    }
    m_refusals = 0;
    return 0;
}

// True when counting again, after somebody else deleted files, finds the total within the quota.
bool MediaStorage::recount_helps() {
    if (m_refusals++ % std::max(CHECKS_PER_RECOUNT, m_recounted / FILES_PER_CHECK) == 0) {
        recount();
    }
    return !above_quota();
}

// Counts what is listed again and drops what is gone from the medium. A working set that is
// gone stays listed: prepare_cur_set deals with it.
void MediaStorage::recount() {
    m_uncertain = false;
    m_size = 0;
    m_recounted = 0;
    android::List<CpSetDirectory*>::iterator it = m_sets.begin();
    while (it != m_sets.end()) {
        CpSetDirectory* set = *it;
        m_recounted += set->recount();
        if (set == m_working_set || dir_usable(set->path())) {
            m_size += set->size();
            ++it;
        } else {
            it = m_sets.erase(it);
            delete set;
        }
    }
}

bool MediaStorage::make_room_with_new_set() {
    if (!m_overwrite || !m_working_set || m_arrived < m_file_size) {
        return false;
    }
    const android::String8 old = m_working_set->path();  // the set itself may go
    const CpSetDirectory* set = start_set();
    if (!set && errno != ENOSPC) {
        m_manager->write_failed(this, errno);  // nothing else is written that could tell
    }
    if (!set || set->path() == old) {
        return false;  // set names have one-second resolution: try later
    }
    m_arrived = 0;
    m_manager->media_vanished(this);
    info_log("nothing else is left to trim, new set %s", set->path().string());
    return check_quota() == 0;
}

CpSetDirectory* MediaStorage::start_set() {
    CpSetDirectory* set = create_cp_set();
    if (!set && errno == ENOSPC && m_overwrite) {
        m_rescan = m_rescan && scan_sets() < 0;
        if (free_space() == 0 || !m_working_set) {
            return create_cp_set();
        }
        // Only what is spared is left, in a set that will not be written to any more.
        const android::String8 old = m_working_set->path();
        m_manager->media_vanished(this);
        m_working_set = nullptr;
        m_vain_trims = 0;
        free_space();
        set = create_cp_set();
        if (!set) {
            m_working_set = find_named(m_sets, &CpSetDirectory::path, old);
        }
    }
    return set;
}

int MediaStorage::free_space() {
    // With a file size of 0 there is nothing to keep in proportion to: anything will do.
    const uint64_t wanted = std::max<uint64_t>(m_file_size, 1);
    return m_overwrite && trim_unless_vain(wanted) >= std::max<uint64_t>(wanted / 2, 1) ? 0 : -1;
}

uint64_t MediaStorage::free_logs() {
    if (!m_overwrite) {
        return 0;
    }
    const uint64_t wanted = std::max<uint64_t>(m_file_size, 1);
    const uint64_t removed = trim_sets_before(wanted);
    return removed + trim_working_set(wanted - std::min(wanted, removed), Spare::ALL_BUT_LOGS);
}
