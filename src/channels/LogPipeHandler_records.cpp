// The part of LogPipeHandler that heads a new directory with the version file and a new log
// file with the time record.
#include <cutils/properties.h>
#include <cutils/sockets.h>
#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include "channels/LogPipeHandler.h"
#include "channels/TimeSyncRecord.h"
#include "config/property_names.h"
#include "core/log.h"
#include "core/system_paths.h"
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
    constexpr int ATTEMPTS = 10;
    constexpr int ATTEMPT_MS = 100;
    int conn = -1;
    int slept_ms = 0;
    for (int i = 0; i < ATTEMPTS; ++i) {
        // Non-blocking: connecting to a service that hangs, its queue full, would wait.
        conn = socket_local_client(SOCKET_TIME_SYNC, ANDROID_SOCKET_NAMESPACE_ABSTRACT,
                                   SOCK_STREAM | SOCK_NONBLOCK);
        if (conn >= 0) {
            break;
        }
        const int connect_errno = errno;
        usleep(ATTEMPT_MS * 1000);
        slept_ms += ATTEMPT_MS;
        errno = connect_errno;
    }
    if (conn < 0) {
        err_log("connect CP time sync server error");
        return false;
    }
    const int flags = fcntl(conn, F_GETFL);
    if (flags == -1) {
        err_log("time sync conn F_GETFL failed");
        ::close(conn);
        return false;
    }
    if (fcntl(conn, F_SETFL, flags | O_NONBLOCK) == -1) {
        err_log("set time sync conn O_NONBLOCK failed");
        ::close(conn);
        return false;
    }
    struct pollfd pfd;
    pfd.fd = conn;
    pfd.events = POLLIN;
    pfd.revents = 0;
    uint8_t reply[TIME_SYNC_REPLY_LEN];
    ssize_t n = 0;
    if (poll(&pfd, 1, ATTEMPTS * ATTEMPT_MS - slept_ms) > 0 && (pfd.revents & POLLIN)) {
        n = read(conn, reply, sizeof(reply));
    }
    ::close(conn);
    if (n < static_cast<ssize_t>(sizeof(reply))) {
        err_log("can not read time info");
        return false;
    }
    const TimeSyncRecord record = make_time_sync_record(reply, time_zone_hours());
    return file->write(&record, sizeof(record)) == static_cast<ssize_t>(sizeof(record));
}
