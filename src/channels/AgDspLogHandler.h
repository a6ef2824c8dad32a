// The log channel of the audio DSP. Its devices are not collected yet: start() refuses
// and says so. Owned by the LogController.
#ifndef CHANNELS_AGDSPLOGHANDLER_H_
#define CHANNELS_AGDSPLOGHANDLER_H_

#include "channels/LogPipeHandler.h"

class AgDspLogHandler : public LogPipeHandler {
public:
    AgDspLogHandler(LogController* ctrl, Multiplexer* mux, const LogConfig::ConfigEntry* entry,
                    StorageManager* stor_mgr);

    int start() override;
    int stop() override;

protected:
    int start_dump(const struct tm& t) override;
};

#endif  // CHANNELS_AGDSPLOGHANDLER_H_
