// SPDX-License-Identifier: Apache-2.0
// The part of LogPipeHandler that reacts to the events of its CP and runs the transactions
// over the diag device.
#include <cutils/properties.h>
#include <errno.h>
#include <poll.h>
#include <stdlib.h>
#include <unistd.h>

#include "channels/CpRingBufConsumer.h"
#include "channels/CpSleepLogConsumer.h"
#include "channels/DiagDeviceHandler.h"
#include "channels/LogPipeHandler.h"
#include "channels/TransClient.h"
#include "control/LogController.h"
#include "core/Multiplexer.h"
#include "core/SavedErrno.h"
#include "core/log.h"
#include "storage/CpStorage.h"
#include "storage/log_name.h"

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
        end_client_transaction(CR_FAILED);
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
    // With all logs off nothing else would: a CP that crashes again and again filled the medium.
    m_storage->check_quota(MT_NONE);
    LogController::save_dipx_dump(m_storage, t);
    if (save_md) {
        m_log_ctrl->save_mini_dump(m_storage, t, m_type);
    }
    if (m_enabled) {
        notify_cp_dump(CDE_START);
        if (start_dump(t) == 0) {
            return;
        }
        {
            const SavedErrno start_errno;
            notify_cp_dump(CDE_END);
        }
        err_log("Start dump transaction error");
    }
    close_on_assert();
}

void LogPipeHandler::close_on_assert() {
    close_dev();
    m_reopen_timer.stop();
    m_state = CWS_NOT_WORKING;
    flush();
}

void LogPipeHandler::process_alive() {
    if (m_state == CWS_DUMP) {
        // The CP was restarted under the dump: what arrived so far is kept.
        end_dump();
        notify_cp_dump(CDE_END);
    } else if (client_transaction_runs()) {
        // A CP that has just come up knows nothing of the request.
        end_client_transaction(CR_FAILED);
    }
    m_state = CWS_WORKING;
    if (!m_enabled) {
        return;
    }
    renew_dev();
    note_alive();  // what the device came to before does not count
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

std::unique_ptr<DiagDeviceHandler> LogPipeHandler::create_diag_device(DataConsumer* consumer) {
    if (m_log_diag_same) {
        if (m_fd < 0) {
            return nullptr;
        }
        return std::make_unique<DiagDeviceHandler>(m_fd, consumer, m_log_ctrl, m_multiplexer);
    }
    auto diag =
        std::make_unique<DiagDeviceHandler>(m_diag_dev_path, consumer, m_log_ctrl, m_multiplexer);
    if (diag->open() < 0) {
        return nullptr;
    }
    return diag;
}

int LogPipeHandler::run_transaction(std::unique_ptr<DiagDeviceHandler> diag,
                                    std::unique_ptr<DataConsumer> consumer, CpWorkState state) {
    if (!diag) {
        return -1;
    }
    if (m_log_diag_same) {
        // Only the diag handler reads the device now. It takes this one's place in the loop,
        // which may have no other left.
        m_multiplexer->hand_over(this, diag.get());
    }
    diag->poll_when_room(POLLIN, (m_log_diag_same ? m_log_dev_path : m_diag_dev_path).string());
    consumer->bind(diag.get());
    if (consumer->start() == 0) {
        start_transaction(std::move(diag), std::move(consumer), state);
        return 0;
    }
    const SavedErrno start_errno;
    take_place_back(diag.get());
    return -1;
}

// The log device is polled again where the diag handler was polled for it.
void LogPipeHandler::take_place_back(DiagDeviceHandler* diag) {
    if (m_log_diag_same && m_fd >= 0) {
        m_multiplexer->hand_over(diag, this);
        poll_dev();
    }
}

void LogPipeHandler::start_transaction(std::unique_ptr<DiagDeviceHandler> diag,
                                       std::unique_ptr<DataConsumer> consumer, CpWorkState state) {
    m_diag_handler = std::move(diag);
    m_consumer = std::move(consumer);
    m_state = state;
}

void LogPipeHandler::stop_transaction(CpWorkState new_state) {
    take_place_back(m_diag_handler.get());
    m_consumer.reset();
    m_diag_handler.reset();
    m_state = new_state;
}

void LogPipeHandler::end_dump() {
    stop_transaction(CWS_NOT_WORKING);
    close_on_assert();
}

// ---- Transactions for clients

// CR_OK when a client's transaction can start, else the result that refuses it.
int LogPipeHandler::check_client_transaction() const {
    if (!m_enabled) {
        return CR_LOG_DISABLED;
    }
    if (m_state == CWS_NOT_WORKING) {
        return CR_NOT_WORKING;
    }
    return m_state == CWS_WORKING ? CR_OK : CR_BUSY;
}

int LogPipeHandler::begin_client_transaction(std::unique_ptr<DataConsumer> consumer,
                                             CpWorkState state, TransClient* client) {
    consumer->set_callback(this, diag_transaction_notify);
    std::unique_ptr<DiagDeviceHandler> diag = create_diag_device(consumer.get());
    if (run_transaction(std::move(diag), std::move(consumer), state) < 0) {
        return CR_FAILED;
    }
    m_trans_client = client;
    return CR_STARTED;
}

int LogPipeHandler::save_sleep_log(TransClient* client) {
    const int refusal = check_client_transaction();
    if (refusal < 0) {
        return refusal;
    }
    if (!m_storage && create_storage() < 0) {
        return CR_FAILED;
    }
    return begin_client_transaction(
        std::make_unique<CpSleepLogConsumer>(m_name.string(), m_storage), CWS_SAVE_SLEEP_LOG,
        client);
}

int LogPipeHandler::save_ringbuf(TransClient* client) {
    const int refusal = check_client_transaction();
    if (refusal < 0) {
        return refusal;
    }
    if (!m_storage && create_storage() < 0) {
        return CR_FAILED;
    }
    return begin_client_transaction(std::make_unique<CpRingBufConsumer>(m_name.string(), m_storage),
                                    CWS_SAVE_RINGBUF, client);
}

void LogPipeHandler::cancel_trans_result_notify(TransClient* client) {
    if (m_trans_client.get() == client) {
        m_trans_client = nullptr;
    }
}

void LogPipeHandler::end_client_transaction(int result) {
    stop_transaction(CWS_WORKING);
    // The next try to open the log device may have fallen into the transaction.
    open_missing_dev();
    TransClient* client = m_trans_client.get();
    m_trans_client = nullptr;
    if (client) {
        client->trans_ended(result);
    }
}

void LogPipeHandler::diag_transaction_notify(void* client, DataConsumer::LogProcResult result) {
    LogPipeHandler* handler = static_cast<LogPipeHandler*>(client);
    if (!handler->client_transaction_runs()) {
        err_log("Receive diag notify %d under state %d, ignore", result, handler->m_state);
        return;
    }
    int client_result = CR_FAILED;
    if (result == DataConsumer::LPR_SUCCESS) {
        client_result = CR_OK;
    } else if (result == DataConsumer::LPR_SLEEPLOG_NO_SUPPORT) {
        client_result = CR_NO_SLEEP_LOG;
    } else if (result == DataConsumer::LPR_RINGBUF_NO_SUPPORT) {
        client_result = CR_NO_RINGBUF;
    }
    handler->end_client_transaction(client_result);
}
