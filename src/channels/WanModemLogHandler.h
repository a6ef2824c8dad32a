// The log channel of a cellular modem in one of its radio modes. Owned by the
// LogController.
#ifndef CHANNELS_WANMODEMLOGHANDLER_H_
#define CHANNELS_WANMODEMLOGHANDLER_H_

#include "channels/LogPipeHandler.h"

class WanModemLogHandler : public LogPipeHandler {
public:
  // mem_path: the kernel file with the modem's memory, as fixed for its type.
  WanModemLogHandler(LogController *ctrl, Multiplexer *mux,
                     const LogConfig::ConfigEntry *entry,
                     StorageManager *stor_mgr, const char *mem_path);

  int start() override;
  int stop() override;

protected:
  int start_dump(const struct tm &t) override;

private:
  static void diag_transaction_notify(void *client,
                                      DataConsumer::LogProcResult result);

  android::String8 m_mem_path;
};

#endif // CHANNELS_WANMODEMLOGHANDLER_H_
