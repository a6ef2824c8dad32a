// The part of MediaStorage that keeps the medium within its limits.
#include "core/log.h"
#include "storage/CpSetDirectory.h"
#include "storage/MediaStorage.h"

uint64_t MediaStorage::trim(uint64_t wanted) {
    uint64_t removed = 0;
    android::List<CpSetDirectory*>::iterator it = m_sets.begin();
    while (it != m_sets.end()) {
        CpSetDirectory* set = *it;
        if (set == m_working_set) {
            ++it;
            continue;
        }
        const uint64_t n = set->trim(wanted);
        removed += n;
        if (set->empty()) {
            it = m_sets.erase(it);
            set->remove();
            delete set;
        } else {
            ++it;
        }
        if (n >= wanted) {
            wanted = 0;
            break;
        }
        wanted -= n;
    }
    m_size -= removed;
    if (wanted > 0 && m_working_set) {
        const uint64_t n = m_working_set->trim_working_dir(wanted);
        m_size -= n;
        removed += n;
    }
    return removed;
}

int MediaStorage::check_quota() {
    if (m_quota == 0 || m_size <= m_quota) {
        return 0;
    }
    if (!m_overwrite) {
        return -1;
    }
    info_log("data large: %u/%uM", static_cast<unsigned int>(m_size),
             static_cast<unsigned int>(m_quota >> 20));
    trim(m_size - m_quota);
    return m_size <= m_quota ? 0 : -1;
}

int MediaStorage::free_space() {
    if (!m_overwrite) {
        return -1;
    }
    return trim(m_file_size) >= m_file_size / 2 ? 0 : -1;
}
