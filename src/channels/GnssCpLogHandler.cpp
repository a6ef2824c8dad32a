// SPDX-License-Identifier: Apache-2.0

#include "channels/GnssCpLogHandler.h"

GnssCpLogHandler::GnssCpLogHandler(LogController* ctrl, Multiplexer* mux,
                                   const LogConfig::ConfigEntry* entry, StorageManager* stor_mgr)
    : LogPipeHandler(ctrl, mux, entry, stor_mgr) {}

int GnssCpLogHandler::start() {
    return start_logging();
}

int GnssCpLogHandler::stop() {
    return stop_logging();
}

int GnssCpLogHandler::start_dump(const struct tm& /*t*/) {
    return -1;
}
