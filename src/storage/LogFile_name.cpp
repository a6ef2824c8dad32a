// SPDX-License-Identifier: Apache-2.0
// The part of LogFile that reads and changes its name.
#include "core/log.h"
#include "storage/CpDirectory.h"
#include "storage/LogFile.h"
#include "storage/log_name.h"
#include "storage/paths.h"

int LogFile::rename_to(const android::String8& dir_path, const android::String8& new_name) {
    if (rename_to_free_name(JoinedPath(dir_path, m_name).string(),
                            JoinedPath(dir_path, new_name).string()) < 0) {
        return -1;
    }
    m_name = new_name;
    return 0;
}

int LogFile::rotate(const android::String8& dir_path) {
    uint32_t number;
    size_t digits;
    // The largest number has no successor: it would wrap to 0, the newest file's.
    if (parse_log_number(m_name, number, digits) < 0 || number == UINT32_MAX) {
        err_log("invalid log file name %s", m_name.string());
        return -1;
    }
    if (rename_to(dir_path, with_number(m_name, number + 1, digits)) < 0) {
        err_log("rename %s failed", m_name.string());
        return -1;
    }
    return 0;
}

int LogFile::change_name_num(unsigned int num) {
    uint32_t number;
    size_t digits;
    if (parse_log_number(m_name, number, digits) < 0) {
        return -1;
    }
    if (number == num) {
        return 0;
    }
    if (rename_to(m_dir->path(), with_number(m_name, num, digits)) < 0) {
        err_log("rename number in %s failed", m_name.string());
        return -1;
    }
    return 0;
}

void LogFile::parse_name() {
    m_type = parse_log_name(m_name.string(), m_name.length(), m_time);
}
