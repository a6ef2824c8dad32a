// SPDX-License-Identifier: Apache-2.0

#include "channels/WanModemLogHandler.h"

#include "channels/DiagDeviceHandler.h"
#include "channels/ModemDumpConsumer.h"
#include "core/log.h"
#include "core/system_paths.h"
#include "storage/CpStorage.h"

WanModemLogHandler::WanModemLogHandler(LogController* ctrl, Multiplexer* mux,
                                       const LogConfig::ConfigEntry* entry,
                                       StorageManager* stor_mgr, const char* mem_path)
    : LogPipeHandler(ctrl, mux, entry, stor_mgr), m_mem_path(system_path(mem_path)) {}

WanModemLogHandler::~WanModemLogHandler() {
    unsubscribe();
}

int WanModemLogHandler::start() {
    const int result = start_logging();
    if (result < 0) {
        return -1;
    }
    if (storage() && !m_subscribed) {
        storage()->subscribe_media_change_evt(on_media_change, this);
        m_subscribed = true;
        save_current_parsing_lib();
    }
    return 0;
}

int WanModemLogHandler::stop() {
    unsubscribe();
    return stop_logging();
}

void WanModemLogHandler::unsubscribe() {
    if (m_subscribed) {
        storage()->unsubscribe_media_change_evt(this);
        m_subscribed = false;
    }
}

int WanModemLogHandler::start_dump(const struct tm& t) {
    auto consumer =
        std::make_unique<ModemDumpConsumer>(name().string(), storage(), t, m_mem_path.string());
    consumer->set_callback(this, diag_transaction_notify);
    std::unique_ptr<DiagDeviceHandler> diag = create_diag_device(consumer.get());
    return run_transaction(std::move(diag), std::move(consumer), CWS_DUMP);
}

void WanModemLogHandler::diag_transaction_notify(void* client, DataConsumer::LogProcResult result) {
    WanModemLogHandler* handler = static_cast<WanModemLogHandler*>(client);
    if (handler->state() != CWS_DUMP) {
        err_log("Receive diag notify %d under state %d, ignore", result, handler->state());
        return;
    }
    handler->end_dump();
    handler->notify_cp_dump(CDE_END);
}
