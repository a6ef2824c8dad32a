// SPDX-License-Identifier: Apache-2.0

#include "channels/LogPipeHandler.h"

#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include "channels/DiagDeviceHandler.h"
#include "config/property_names.h"
#include "control/LogController.h"
#include "core/Multiplexer.h"
#include "core/log.h"
#include "storage/CpStorage.h"
#include "storage/StorageManager.h"

namespace {

// Whether both descriptors are of one file that has an end: opened anew it begins again.
bool same_file(int a, int b) {
    struct stat sa;
    struct stat sb;
    return fstat(a, &sa) == 0 && fstat(b, &sb) == 0 && sa.st_dev == sb.st_dev &&
           sa.st_ino == sb.st_ino && (S_ISREG(sa.st_mode) || S_ISBLK(sa.st_mode));
}

}  // namespace

uint8_t LogPipeHandler::s_io_buffer[IO_BUFFER_SIZE];

LogPipeHandler::LogPipeHandler(LogController* ctrl, Multiplexer* mux,
                               const LogConfig::ConfigEntry* entry, StorageManager* stor_mgr)
    : CpChannel(-1, ctrl, mux),
      m_name(entry->name),
      m_type(entry->type),
      m_reset_prop(entry->type == CT_WCN ? PROP_WCN_RESET : PROP_MODEM_RESET),
      m_stor_mgr(stor_mgr),
      m_reopen_timer(&mux->timer_mgr(), reopen_log_dev, this),
      m_iq(this) {}

LogPipeHandler::~LogPipeHandler() {
    m_iq.stop();
    // The consumer may hold a file and a subscription of the storage.
    stop_transaction(CWS_NOT_WORKING);
    m_reopen_timer.stop();
    if (m_storage) {
        m_stor_mgr->delete_storage(m_storage);
    }
}

void LogPipeHandler::set_dev_paths(const android::String8& log, const android::String8& diag) {
    m_log_dev_path = log;
    m_diag_dev_path = diag;
    m_log_diag_same = false;
}

void LogPipeHandler::set_log_diag_dev_path(const android::String8& path) {
    m_log_dev_path = path;
    m_diag_dev_path = android::String8();
    m_log_diag_same = true;
}

int LogPipeHandler::open_dev() {
    if (m_fd < 0) {
        m_fd = open(m_log_dev_path.string(), O_RDWR | O_NONBLOCK | O_NOCTTY | O_CLOEXEC);
    }
    return m_fd < 0 ? -1 : 0;
}

// A driver may have hung up the descriptor for good, when it was reset with its CP, say: one that
// gave nothing when it was last read is replaced. The new one is opened first, so that what waits
// in the device survives. A file in its place is kept, to be read on when it has grown.
void LogPipeHandler::renew_dev() {
    if (m_fd >= 0 && idle_wakeups() > 0) {
        const int old = m_fd;
        del_events(POLLIN);
        m_fd = -1;
        open_dev();
        if (m_fd >= 0 && same_file(m_fd, old)) {
            close();
            m_fd = old;
            return;
        }
        ::close(old);
    }
}

void LogPipeHandler::close_dev() {
    if (m_fd >= 0) {
        del_events(POLLIN);
        close();
    }
}

android::String8 LogPipeHandler::dev_label() const {
    return android::String8("log device of ") + m_name;
}

void LogPipeHandler::poll_dev() {
    poll_when_room(POLLIN, dev_label().string());
}

void LogPipeHandler::arm_reopen() {
    m_reopen_timer.start_or_log(REOPEN_MS);
}

void LogPipeHandler::open_missing_dev() {
    if (m_fd < 0 && !m_reopen_timer.pending()) {
        reopen_log_dev(this);
    }
}

void LogPipeHandler::reopen_log_dev(void* handler) {
    LogPipeHandler* channel = static_cast<LogPipeHandler*>(handler);
    if (!channel->m_enabled || channel->m_state != CWS_WORKING) {
        return;
    }
    if (channel->open_dev() < 0) {
        err_log("kestcp: reopen %s error", channel->m_name.string());
        channel->arm_reopen();
        return;
    }
    channel->poll_dev();
}

int LogPipeHandler::start_logging() {
    m_enabled = true;
    if (m_state == CWS_WORKING) {
        note_alive();  // what the device came to before does not count
        if (open_dev() < 0) {
            err_log("kestcp: open %s error", m_name.string());
            arm_reopen();
        } else {
            poll_dev();
        }
    }
    if (!m_storage && create_storage() < 0) {
        err_log("create_storage error");
    }
    if (m_save_wcdma_iq && m_storage && m_iq.start(m_storage) < 0) {
        err_log("start saving WCDMA I/Q error");
    }
    return 0;
}

int LogPipeHandler::stop_logging() {
    if (m_iq.state() != WcdmaIqManager::IQS_IDLE && m_iq.stop() < 0) {
        err_log("stop saving WCDMA I/Q error");
    }
    if (m_storage) {
        m_storage->flush();  // unlike stop, tells the medium when that fails
        m_storage->stop();
    }
    m_enabled = false;
    m_reopen_timer.stop();
    if (m_state == CWS_DUMP) {
        // The CP has asserted and stays so until it is alive again.
        stop_transaction(CWS_NOT_WORKING);
        notify_cp_dump(CDE_END);
    } else if (client_transaction_runs()) {
        end_client_transaction(CR_FAILED);
    }
    close_dev();
    return 0;
}

int LogPipeHandler::create_storage() {
    m_storage = m_stor_mgr->create_storage(this);
    if (!m_storage) {
        err_log("create %s CpStorage failed", m_name.string());
        return -1;
    }
    if (is_modem()) {
        m_storage->set_new_log_callback(new_log_callback);
        m_storage->set_new_dir_callback(new_dir_callback);
    }
    return 0;
}

bool LogPipeHandler::need_storage() {
    if (!m_storage) {
        m_storage = m_stor_mgr->create_storage(this);
        if (!m_storage) {
            return false;
        }
        m_storage->set_new_log_callback(new_log_callback);
    }
    return true;
}

void LogPipeHandler::dev_gave_nothing() {
    note_idle(dev_label().string());
    if (resting() && m_fd >= 0) {  // once a rest
        renew_dev();
        if (m_fd >= 0) {
            poll_dev();
        } else {
            arm_reopen();
        }
    }
}

void LogPipeHandler::dev_read_failed() {
    if (errno != EAGAIN && errno != EINTR) {
        close_dev();
        if (open_dev() == 0) {
            poll_dev();
        } else {
            arm_reopen();
        }
    }
    dev_gave_nothing();
}

void LogPipeHandler::process(int /*events*/) {
    const ssize_t n = read(m_fd, s_io_buffer, IO_BUFFER_SIZE);
    if (n < 0) {
        dev_read_failed();
        return;
    }
    if (n == 0) {
        err_log("log device driver bug: read returns 0");
        dev_gave_nothing();
        return;
    }
    note_alive();
    if (!m_storage && create_storage() < 0) {
        return;
    }
    const int written = m_storage->write(s_io_buffer, static_cast<size_t>(n));
    if (written < 0) {
        err_log("CP %s save log error", m_name.string());
    } else if (written < n) {
        info_log("CP %s save log: %d of %d bytes lost", m_name.string(),
                 static_cast<int>(n) - written, static_cast<int>(n));
    }
}

void LogPipeHandler::flush() {
    open_missing_dev();
    if (m_storage) {
        m_storage->flush();
    }
}

// ---- WCDMA I/Q capture

int LogPipeHandler::enable_wcdma_iq() {
    m_save_wcdma_iq = true;
    return 0;
}

int LogPipeHandler::disable_wcdma_iq() {
    if (!m_save_wcdma_iq) {
        return 0;
    }
    if (!m_enabled) {
        m_save_wcdma_iq = false;
        return -1;
    }
    if (m_iq.stop() < 0) {
        return -1;
    }
    m_save_wcdma_iq = false;
    return 0;
}

int LogPipeHandler::pause_wcdma_iq() {
    if (m_iq.state() != WcdmaIqManager::IQS_IDLE) {
        m_iq.pause();
        m_iq.clear_files();
    }
    return 0;
}

int LogPipeHandler::resume_wcdma_iq() {
    if (m_iq.state() != WcdmaIqManager::IQS_IDLE) {
        m_iq.resume();
    }
    return 0;
}
