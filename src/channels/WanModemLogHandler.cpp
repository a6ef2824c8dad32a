#include "channels/WanModemLogHandler.h"

#include "channels/DiagDeviceHandler.h"
#include "channels/ModemDumpConsumer.h"
#include "core/log.h"
#include "core/system_paths.h"

WanModemLogHandler::WanModemLogHandler(LogController *ctrl, Multiplexer *mux,
                                       const LogConfig::ConfigEntry *entry,
                                       StorageManager *stor_mgr,
                                       const char *mem_path)
    : LogPipeHandler(ctrl, mux, entry, stor_mgr),
      m_mem_path(system_path(mem_path)) {}

int WanModemLogHandler::start() { return start_logging(); }

int WanModemLogHandler::stop() { return stop_logging(); }

int WanModemLogHandler::start_dump(const struct tm &t) {
  ModemDumpConsumer *consumer =
      new ModemDumpConsumer(name().string(), storage(), t, m_mem_path.string());
  consumer->set_callback(this, diag_transaction_notify);
  return run_transaction(create_diag_device(consumer), consumer, CWS_DUMP);
}

void WanModemLogHandler::diag_transaction_notify(
    void *client, DataConsumer::LogProcResult result) {
  WanModemLogHandler *handler = static_cast<WanModemLogHandler *>(client);
  if (handler->state() != CWS_DUMP) {
    err_log("Receive diag notify %d under state %d, ignore", result,
            handler->state());
    return;
  }
  handler->end_dump();
  handler->notify_cp_dump(CDE_END);
}
