// SPDX-License-Identifier: Apache-2.0
// The log channel of the external wireless-connectivity chip. Owned by the LogController.
#ifndef CHANNELS_EXTWCNLOGHANDLER_H_
#define CHANNELS_EXTWCNLOGHANDLER_H_

#include "channels/LogPipeHandler.h"

class ExtWcnLogHandler : public LogPipeHandler {
public:
    ExtWcnLogHandler(LogController* ctrl, Multiplexer* mux, const LogConfig::ConfigEntry* entry,
                     StorageManager* stor_mgr);

    int start() override;
    int stop() override;
    int start_dump(const struct tm& t) override;

    static void diag_transaction_notify(void* client, DataConsumer::LogProcResult result);
};

#endif  // CHANNELS_EXTWCNLOGHANDLER_H_
