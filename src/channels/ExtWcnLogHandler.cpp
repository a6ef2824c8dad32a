#include "channels/ExtWcnLogHandler.h"

ExtWcnLogHandler::ExtWcnLogHandler(LogController* ctrl, Multiplexer* mux,
                                   const LogConfig::ConfigEntry* entry, StorageManager* stor_mgr)
    : LogPipeHandler(ctrl, mux, entry, stor_mgr) {}

int ExtWcnLogHandler::start() {
    return start_logging();
}

int ExtWcnLogHandler::stop() {
    return stop_logging();
}

int ExtWcnLogHandler::start_dump(const struct tm& /*t*/) {
    return -1;
}
