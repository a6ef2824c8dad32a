// SPDX-License-Identifier: Apache-2.0
// Fetches a CP's sleep log into a file. Owned by the channel for one transaction.
#ifndef CHANNELS_CPSLEEPLOGCONSUMER_H_
#define CHANNELS_CPSLEEPLOGCONSUMER_H_

#include "channels/DiagReplyConsumer.h"

class CpSleepLogConsumer : public DiagReplyConsumer {
public:
    CpSleepLogConsumer(const char* cp_name, CpStorage* storage);

    int start() override;

    // Makes the result file, named by the present local time. Null on failure.
    LogFile* open_file();

    // Called by both time-outs of the exchange.
    static void sleep_log_read_timeout(void* consumer);

private:
    static const Exchange EXCHANGE;
};

#endif  // CHANNELS_CPSLEEPLOGCONSUMER_H_
