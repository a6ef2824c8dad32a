// SPDX-License-Identifier: Apache-2.0
// Watches the logs that the service writes for a simulated handset and checks them in the
// end. Each scan opens every log file it has not seen before and keeps it open, so that a
// file that the quota deletes later can still be read: every byte is checked, also those
// that are no longer there. A file is not deleted before it is full, so scan at least once
// for every log file size that is fed to a CP; then no file is missed.
#ifndef SIM_LOGCOLLECTOR_H_
#define SIM_LOGCOLLECTOR_H_

#include <stdint.h>
#include <sys/types.h>

#include <string>
#include <vector>

#include "sim/StreamCheck.h"

class SimHandset;
struct SimCp;

class LogCollector {
public:
    struct Medium {
        std::string name;
        std::string log_root;
        uint64_t quota = 0;  // bytes; 0 for no limit
        uint64_t bytes = 0;  // of all files in the CP directories of all sets
        unsigned files = 0;
        unsigned sets = 0;
    };

    // The handset must have all its CPs and outlive the collector. With kest_dir the logs
    // are looked for below the directory "kest" of each medium.
    explicit LogCollector(const SimHandset& handset, bool kest_dir = false);
    ~LogCollector();
    LogCollector(const LogCollector&) = delete;
    LogCollector& operator=(const LogCollector&) = delete;

    void scan();

    // As of the last scan: the internal medium and the SD card.
    const std::vector<Medium>& media() const { return m_media; }
    // The service was told another quota for the medium of this name.
    void set_quota(const std::string& medium, unsigned mb);
    // The medium written last; null while there is no log file.
    const Medium* in_use() const { return m_in_use < 0 ? nullptr : &m_media[size_t(m_in_use)]; }
    // Log files that were deleted, and their bytes, as seen so far.
    unsigned trimmed_files() const { return m_trimmed_files; }
    uint64_t trimmed_bytes() const { return m_trimmed_bytes; }

    // Stream position behind the last byte of the CP that is in a file.
    uint64_t end_position(const SimCp& cp) const;
    // Scans once more and checks everything that was ever logged of the CP.
    StreamCheck::Result check(const SimCp& cp);

private:
    struct LogFileSeen {
        int fd;
        dev_t dev;
        ino_t ino;
        size_t cp;
        std::string dir;  // as of the last scan that met it
        unsigned long number;
    };

    void scan_cp_dir(Medium& medium, const std::string& dir, size_t cp);
    size_t index_of(const std::string& cp_name) const;

    const SimHandset& m_handset;
    std::vector<Medium> m_media;
    std::vector<LogFileSeen> m_seen;
    std::vector<StreamCheck> m_checks;  // for each CP; they hold the deleted files' pieces
    int m_in_use = -1;
    int64_t m_last_write = 0;  // ns
    unsigned m_trimmed_files = 0;
    uint64_t m_trimmed_bytes = 0;
};

#endif  // SIM_LOGCOLLECTOR_H_
