// The part of CpDirectory that numbers the log files: 0 is the newest.
#include <stdint.h>

#include "core/log.h"
#include "storage/CpDirectory.h"
#include "storage/LogFile.h"
#include "storage/log_name.h"

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
