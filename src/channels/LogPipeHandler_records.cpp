// SPDX-License-Identifier: Apache-2.0
// The part of LogPipeHandler that heads a new directory with the version file and a new log
// file with the time record.
#include <cutils/properties.h>

#include "channels/LogPipeHandler.h"
#include "channels/TimeSyncClient.h"
#include "config/property_names.h"
#include "core/log.h"
#include "storage/CpStorage.h"
#include "storage/LogFile.h"

namespace {

// The storage calls back with the channel that it was made for.
LogPipeHandler* log_pipe(CpChannel* channel) {
    return static_cast<LogPipeHandler*>(channel);
}

}  // namespace

void LogPipeHandler::new_log_callback(CpChannel* channel, LogFile* file) {
    log_pipe(channel)->save_timestamp(file);
}

void LogPipeHandler::new_dir_callback(CpChannel* channel) {
    log_pipe(channel)->save_version();
}

bool LogPipeHandler::save_version() {
    char version[PROPERTY_VALUE_MAX];
    const int len = property_get(PROP_BASEBAND_VERSION, version, "");
    if (len <= 0) {
        return false;
    }
    android::String8 file_name(m_name);
    file_name.append(".version");
    LogFile* file = m_storage->create_file(file_name, LT_VERSION, MT_NONE);
    if (!file) {
        return false;
    }
    const bool written = file->write(version, static_cast<size_t>(len)) == len;
    file->close();
    return written;
}

bool LogPipeHandler::save_timestamp(LogFile* file) {
    uint8_t reply[TIME_SYNC_REPLY_LEN];
    switch (TimeSyncClient().ask(reply)) {
        case TimeSyncClient::TSF_NO_CONNECTION:
            err_log("connect CP time sync server error");
            return false;
        case TimeSyncClient::TSF_NO_FLAGS:
            err_log("time sync conn F_GETFL failed");
            return false;
        case TimeSyncClient::TSF_FLAGS_NOT_SET:
            err_log("set time sync conn O_NONBLOCK failed");
            return false;
        case TimeSyncClient::TSF_NO_REPLY:
            err_log("can not read time info");
            return false;
        case TimeSyncClient::TSF_NONE:
            break;
    }
    const TimeSyncRecord record = make_time_sync_record(reply, time_zone_hours());
    return file->write(&record, sizeof(record)) == static_cast<ssize_t>(sizeof(record));
}
