#include "channels/WanModemLogHandler.h"

#include "core/system_paths.h"

WanModemLogHandler::WanModemLogHandler(LogController* ctrl, Multiplexer* mux,
                                       const LogConfig::ConfigEntry* entry,
                                       StorageManager* stor_mgr, const char* mem_path)
    : LogPipeHandler(ctrl, mux, entry, stor_mgr), m_mem_path(system_path(mem_path)) {}

int WanModemLogHandler::start() {
    return start_logging();
}

int WanModemLogHandler::stop() {
    return stop_logging();
}

int WanModemLogHandler::start_dump(const struct tm& /*t*/) {
    return -1;
}
