// Fetches a CP's sleep log into a file. Owned by the channel for one transaction.
#ifndef CHANNELS_CPSLEEPLOGCONSUMER_H_
#define CHANNELS_CPSLEEPLOGCONSUMER_H_

#include "channels/DiagReplyConsumer.h"

class CpSleepLogConsumer : public DiagReplyConsumer {
public:
    CpSleepLogConsumer(const char* cp_name, CpStorage* storage);

protected:
    LogFile* open_file() override;

private:
    static const Exchange EXCHANGE;

    static void sleep_log_read_timeout(void* consumer);
};

#endif  // CHANNELS_CPSLEEPLOGCONSUMER_H_
