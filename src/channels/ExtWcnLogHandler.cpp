// SPDX-License-Identifier: Apache-2.0

#include "channels/ExtWcnLogHandler.h"

#include "channels/DiagDeviceHandler.h"
#include "channels/ExtWcnDumpConsumer.h"
#include "core/log.h"

ExtWcnLogHandler::ExtWcnLogHandler(LogController* ctrl, Multiplexer* mux,
                                   const LogConfig::ConfigEntry* entry, StorageManager* stor_mgr)
    : LogPipeHandler(ctrl, mux, entry, stor_mgr) {}

int ExtWcnLogHandler::start() {
    return start_logging();
}

int ExtWcnLogHandler::stop() {
    return stop_logging();
}

int ExtWcnLogHandler::start_dump(const struct tm& t) {
    auto consumer = std::make_unique<ExtWcnDumpConsumer>(name().string(), storage(), t);
    consumer->set_callback(this, diag_transaction_notify);
    std::unique_ptr<DiagDeviceHandler> diag = create_diag_device(consumer.get());
    return run_transaction(std::move(diag), std::move(consumer), CWS_DUMP);
}

void ExtWcnLogHandler::diag_transaction_notify(void* client, DataConsumer::LogProcResult result) {
    ExtWcnLogHandler* handler = static_cast<ExtWcnLogHandler*>(client);
    if (handler->state() != CWS_DUMP) {
        err_log("Receive diag notify %d under state %d, ignore", result, handler->state());
        return;
    }
    handler->end_dump();
    handler->notify_cp_dump(CDE_END);
}
