// SPDX-License-Identifier: Apache-2.0
// The diag device of a CP during a transaction: feeds what it reads to the
// transaction's DataConsumer. Owned by the channel, like the consumer.
#ifndef CHANNELS_DIAGDEVICEHANDLER_H_
#define CHANNELS_DIAGDEVICEHANDLER_H_

#include "channels/DeviceFileHandler.h"

class DataConsumer;

class DiagDeviceHandler : public DeviceFileHandler {
public:
    static constexpr size_t BUFFER_SIZE = 32768;

    DiagDeviceHandler(const android::String8& path, DataConsumer* consumer, LogController* ctrl,
                      Multiplexer* mux);
    DiagDeviceHandler(int fd, DataConsumer* consumer, LogController* ctrl, Multiplexer* mux);

    bool process_data(DataBuffer& buf) override;

private:
    DataConsumer* m_consumer;
};

#endif  // CHANNELS_DIAGDEVICEHANDLER_H_
