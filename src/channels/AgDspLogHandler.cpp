#include "channels/AgDspLogHandler.h"

#include <errno.h>

#include "core/log.h"

AgDspLogHandler::AgDspLogHandler(LogController* ctrl, Multiplexer* mux,
                                 const LogConfig::ConfigEntry* entry, StorageManager* stor_mgr)
    : LogPipeHandler(ctrl, mux, entry, stor_mgr) {}

int AgDspLogHandler::start() {
    errno = ENOSYS;
    err_log("audio DSP %s is not supported yet", name().string());
    return -1;
}

int AgDspLogHandler::stop() {
    return stop_logging();
}

int AgDspLogHandler::start_dump(const struct tm& /*t*/) {
    return -1;
}
