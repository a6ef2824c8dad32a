#include "channels/LogPipeHandler.h"

#include <cutils/properties.h>
#include <cutils/sockets.h>
#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <stdlib.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include "channels/CpRingBufConsumer.h"
#include "channels/CpSleepLogConsumer.h"
#include "channels/DiagDeviceHandler.h"
#include "channels/TimeSyncRecord.h"
#include "client/ClientHandler.h"
#include "config/property_names.h"
#include "control/LogController.h"
#include "core/Multiplexer.h"
#include "core/log.h"
#include "core/system_paths.h"
#include "storage/CpDirectory.h"
#include "storage/CpStorage.h"
#include "storage/log_name.h"

uint8_t LogPipeHandler::s_io_buffer[IO_BUFFER_SIZE];

LogPipeHandler::LogPipeHandler(LogController* ctrl, Multiplexer* mux,
                               const LogConfig::ConfigEntry* entry, StorageManager* stor_mgr)
    : FdHandler(-1, ctrl, mux),
      m_name(entry->name),
      m_type(entry->type),
      m_reset_prop(entry->type == CT_WCN ? PROP_WCN_RESET : PROP_MODEM_RESET),
      m_stor_mgr(stor_mgr),
      m_iq(this, ctrl, mux) {}

LogPipeHandler::~LogPipeHandler() {
    m_iq.stop();
    // The consumer may hold a file and a subscription of the storage.
    stop_transaction(CWS_NOT_WORKING);
    cancel_reopen();
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

void LogPipeHandler::close_dev() {
    if (m_fd >= 0) {
        del_events(POLLIN);
        close();
    }
}

void LogPipeHandler::poll_dev() {
    if (add_events(POLLIN) < 0) {
        err_log("can not poll the log device of %s", m_name.string());
        // Open but never read it would stay silent for good.
        close();
        arm_reopen();
    }
}

// One timer at the most is pending, so that a device is never opened twice.
void LogPipeHandler::arm_reopen() {
    cancel_reopen();
    m_reopen_timer = m_multiplexer->timer_mgr().create_timer(REOPEN_MS, reopen_log_dev, this);
}

void LogPipeHandler::cancel_reopen() {
    if (m_reopen_timer) {
        m_multiplexer->timer_mgr().del_timer(m_reopen_timer);
        m_reopen_timer = nullptr;
    }
}

void LogPipeHandler::reopen_log_dev(void* handler) {
    LogPipeHandler* channel = static_cast<LogPipeHandler*>(handler);
    channel->m_reopen_timer = nullptr;
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
        m_storage->stop();
    }
    m_enabled = false;
    cancel_reopen();
    if (m_state == CWS_DUMP) {
        // The CP has asserted and stays so until it is alive again.
        stop_transaction(CWS_NOT_WORKING);
        notify_cp_dump(CDE_END);
    } else if (client_transaction_runs()) {
        end_client_transaction(-1);
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
        m_storage->set_new_log_callback(new_log_cb);
        m_storage->set_new_dir_callback(new_dir_cb);
    }
    return 0;
}

bool LogPipeHandler::need_storage() {
    if (!m_storage) {
        m_storage = m_stor_mgr->create_storage(this);
        if (!m_storage) {
            return false;
        }
        m_storage->set_new_log_callback(new_log_cb);
    }
    return true;
}

void LogPipeHandler::recover_dev() {
    close_dev();
    if (open_dev() == 0) {
        poll_dev();
    } else {
        arm_reopen();
    }
}

void LogPipeHandler::process(int /*events*/) {
    const ssize_t n = read(m_fd, s_io_buffer, IO_BUFFER_SIZE);
    if (n < 0) {
        if (errno != EAGAIN && errno != EINTR) {
            recover_dev();
        }
        return;
    }
    if (n == 0) {
        err_log("log device driver bug: read returns 0");
        return;
    }
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
    if (m_storage) {
        m_storage->flush();
    }
}

// ---- CP events

bool LogPipeHandler::will_be_reset() const {
    char value[PROPERTY_VALUE_MAX];
    property_get(m_reset_prop, value, "");
    return strtoul(value, nullptr, 0) == 1;
}

void LogPipeHandler::process_assert(bool save_md) {
    if (m_state == CWS_NOT_WORKING || m_state == CWS_DUMP) {
        return;
    }
    if (client_transaction_runs()) {
        end_client_transaction(-1);
    }
    const bool reset = will_be_reset();
    if (reset && !save_md) {
        m_state = CWS_NOT_WORKING;
        return;
    }
    struct tm t;
    if (!need_storage() || get_local_time(t) < 0) {
        return;
    }
    if (reset) {
        m_log_ctrl->save_mini_dump(m_storage, t, m_type);
        m_state = CWS_NOT_WORKING;
        return;
    }
    LogController::save_dipx_dump(m_storage, t);
    if (save_md) {
        m_log_ctrl->save_mini_dump(m_storage, t, m_type);
    }
    if (m_enabled) {
        notify_cp_dump(CDE_START);
        if (start_dump(t) == 0) {
            return;
        }
        const int start_errno = errno;
        notify_cp_dump(CDE_END);
        errno = start_errno;
        err_log("Start dump transaction error");
    }
    close_on_assert();
}

void LogPipeHandler::close_on_assert() {
    close_dev();
    cancel_reopen();
    flush();
    m_state = CWS_NOT_WORKING;
}

void LogPipeHandler::process_alive() {
    if (m_state == CWS_DUMP) {
        // The CP was restarted under the dump: what arrived so far is kept.
        end_dump();
        notify_cp_dump(CDE_END);
    } else if (client_transaction_runs()) {
        // A CP that has just come up knows nothing of the request.
        end_client_transaction(-1);
    }
    m_state = CWS_WORKING;
    if (!m_enabled) {
        return;
    }
    if (open_dev() < 0) {
        err_log("kestcp: open %s error", m_name.string());
        arm_reopen();
    } else {
        poll_dev();
    }
}

void LogPipeHandler::notify_cp_dump(CpDumpEvent event) {
    m_log_ctrl->notify_cp_dump(m_type, event);
}

// ---- Transactions over the diag device

DiagDeviceHandler* LogPipeHandler::create_diag_device(DataConsumer* consumer) {
    if (m_log_diag_same) {
        if (m_fd < 0) {
            return nullptr;
        }
        return new DiagDeviceHandler(m_fd, consumer, m_log_ctrl, m_multiplexer);
    }
    DiagDeviceHandler* diag =
        new DiagDeviceHandler(m_diag_dev_path, consumer, m_log_ctrl, m_multiplexer);
    if (diag->open() < 0) {
        delete diag;
        return nullptr;
    }
    return diag;
}

int LogPipeHandler::run_transaction(DiagDeviceHandler* diag, DataConsumer* consumer,
                                    CpWorkState state) {
    if (diag && diag->add_events(POLLIN) == 0) {
        consumer->bind(diag);
        if (consumer->start() == 0) {
            start_transaction(diag, consumer, state);
            return 0;
        }
    }
    delete consumer;
    delete diag;
    return -1;
}

void LogPipeHandler::start_transaction(DiagDeviceHandler* diag, DataConsumer* consumer,
                                       CpWorkState state) {
    m_diag_handler = diag;
    m_consumer = consumer;
    m_state = state;
    if (m_log_diag_same) {
        del_events(POLLIN);
    }
}

void LogPipeHandler::stop_transaction(CpWorkState new_state) {
    delete m_consumer;
    m_consumer = nullptr;
    delete m_diag_handler;
    m_diag_handler = nullptr;
    m_state = new_state;
    if (m_log_diag_same && m_fd >= 0) {
        poll_dev();
    }
}

void LogPipeHandler::end_dump() {
    stop_transaction(CWS_NOT_WORKING);
    close_on_assert();
}

// ---- Transactions for clients

// 0 when a client's transaction can start, else the result that refuses it.
int LogPipeHandler::check_client_transaction() const {
    if (!m_enabled) {
        return -3;
    }
    if (m_state == CWS_NOT_WORKING) {
        return -6;
    }
    return m_state == CWS_WORKING ? 0 : -2;
}

int LogPipeHandler::begin_client_transaction(DataConsumer* consumer, CpWorkState state,
                                             ClientHandler* client) {
    consumer->set_callback(this, diag_transaction_notify);
    if (run_transaction(create_diag_device(consumer), consumer, state) < 0) {
        return -1;
    }
    m_trans_client = client;
    return 1;
}

int LogPipeHandler::save_sleep_log(ClientHandler* client) {
    const int refusal = check_client_transaction();
    if (refusal < 0) {
        return refusal;
    }
    if (!m_storage && create_storage() < 0) {
        return -1;
    }
    return begin_client_transaction(new CpSleepLogConsumer(m_name.string(), m_storage),
                                    CWS_SAVE_SLEEP_LOG, client);
}

int LogPipeHandler::save_ringbuf(ClientHandler* client) {
    const int refusal = check_client_transaction();
    if (refusal < 0) {
        return refusal;
    }
    if (!m_storage && create_storage() < 0) {
        return -1;
    }
    return begin_client_transaction(new CpRingBufConsumer(m_name.string(), m_storage),
                                    CWS_SAVE_RINGBUF, client);
}

void LogPipeHandler::cancel_trans_result_notify(ClientHandler* client) {
    if (m_trans_client.get() == client) {
        m_trans_client = nullptr;
    }
}

void LogPipeHandler::end_client_transaction(int result) {
    stop_transaction(CWS_WORKING);
    ClientHandler* client = m_trans_client.get();
    m_trans_client = nullptr;
    if (client) {
        client->notify_trans_result(result);
    }
}

void LogPipeHandler::diag_transaction_notify(void* client, DataConsumer::LogProcResult result) {
    LogPipeHandler* handler = static_cast<LogPipeHandler*>(client);
    if (!handler->client_transaction_runs()) {
        err_log("Receive diag notify %d under state %d, ignore", result, handler->m_state);
        return;
    }
    int client_result = -1;
    if (result == DataConsumer::LPR_SUCCESS) {
        client_result = 0;
    } else if (result == DataConsumer::LPR_SLEEPLOG_NO_SUPPORT) {
        client_result = -4;
    } else if (result == DataConsumer::LPR_RINGBUF_NO_SUPPORT) {
        client_result = -5;
    }
    handler->end_client_transaction(client_result);
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

// ---- What heads a new directory and a new log file

void LogPipeHandler::new_log_cb(LogPipeHandler* handler, LogFile* file) {
    handler->save_timestamp(file);
}

void LogPipeHandler::new_dir_cb(LogPipeHandler* handler) {
    handler->save_version();
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
