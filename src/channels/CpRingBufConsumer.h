// Fetches a CP's ring buffer into a file. Owned by the channel for one transaction.
#ifndef CHANNELS_CPRINGBUFCONSUMER_H_
#define CHANNELS_CPRINGBUFCONSUMER_H_

#include "channels/DiagReplyConsumer.h"

class CpRingBufConsumer : public DiagReplyConsumer {
public:
    CpRingBufConsumer(const char* cp_name, CpStorage* storage);

protected:
    LogFile* open_file() override;

private:
    static const Exchange EXCHANGE;

    static void ring_buffer_read_timeout(void* consumer);
};

#endif  // CHANNELS_CPRINGBUFCONSUMER_H_
