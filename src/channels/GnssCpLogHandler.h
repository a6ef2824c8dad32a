// SPDX-License-Identifier: Apache-2.0
// The log channel of the GNSS receiver. It has no diag device dump. Owned by the LogController.
#ifndef CHANNELS_GNSSCPLOGHANDLER_H_
#define CHANNELS_GNSSCPLOGHANDLER_H_

#include "channels/LogPipeHandler.h"

class GnssCpLogHandler : public LogPipeHandler {
public:
    GnssCpLogHandler(LogController* ctrl, Multiplexer* mux, const LogConfig::ConfigEntry* entry,
                     StorageManager* stor_mgr);

    int start() override;
    int stop() override;
    int start_dump(const struct tm& t) override;
};

#endif  // CHANNELS_GNSSCPLOGHANDLER_H_
