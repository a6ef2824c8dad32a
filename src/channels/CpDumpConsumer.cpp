// SPDX-License-Identifier: Apache-2.0

#include "channels/CpDumpConsumer.h"

#include <errno.h>

#include "core/SavedErrno.h"
#include "core/log.h"
#include "storage/CpStorage.h"

CpDumpConsumer::CpDumpConsumer(const char* cp_name, CpStorage* storage, const struct tm& dump_time)
    : DataConsumer(cp_name, storage), m_dump_time(dump_time) {}

CpDumpConsumer::~CpDumpConsumer() {
    close_dump_file();
}

android::String8 CpDumpConsumer::file_name(const char* extension) const {
    android::String8 name(m_cp_name);
    name.appendFormat("_memory_%s.%s", LogTime::from_tm(m_dump_time).file_stamp().string(),
                      extension);
    return name;
}

LogFile* CpDumpConsumer::open_dump_file() {
    const android::String8 name = file_name("dmp");
    m_dump_file = m_storage->create_file(name, LT_DUMP, MT_NONE);
    if (!m_dump_file) {
        err_log("open dump file %s failed", name.string());
    }
    return m_dump_file.get();
}

LogFile* CpDumpConsumer::open_dump_mem_file() {
    const android::String8 name = file_name("mem");
    LogFile* file = m_storage->create_file(name, LT_DUMP, MT_NONE);
    if (!file) {
        err_log("open dump mem file %s failed", name.string());
    }
    return file;
}

void CpDumpConsumer::close_dump_file() {
    if (m_dump_file && !m_dump_file->exists()) {
        discard_dump_file();
    } else if (m_dump_file) {
        m_dump_file->close();
        m_dump_file = nullptr;
    }
}

bool CpDumpConsumer::dump_file_there() {
    if (m_dump_file && m_dump_file->exists()) {
        return true;
    }
    info_log("dump file of %s is gone", m_cp_name);
    discard_dump_file();
    errno = ENOENT;
    return false;
}

int CpDumpConsumer::write_out_dump_file() {
    return checked(dump_file_there() ? m_dump_file->write_out() : -1);
}

// What is saved instead of a dump that could not be written goes to the other medium when this
// one fails.
int CpDumpConsumer::checked(ssize_t result) {
    if (result == -1 && m_dump_file && errno != ENOSPC) {
        const SavedErrno keep;
        m_storage->write_failed(m_dump_file->media(), errno);
    }
    return static_cast<int>(result);
}

bool CpDumpConsumer::dump_on_sd() const {
    return m_dump_file && m_storage->on_sd(m_dump_file.get());
}

void CpDumpConsumer::discard_dump_file() {
    if (m_dump_file) {
        m_dump_file->discard();
    }
}

ssize_t CpDumpConsumer::write_dump(const void* data, size_t len) {
    return checked(dump_file_there() ? m_dump_file->write(data, len) : -1);
}
