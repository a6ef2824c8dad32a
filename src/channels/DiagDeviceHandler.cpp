// SPDX-License-Identifier: Apache-2.0

#include "channels/DiagDeviceHandler.h"

#include "channels/DataConsumer.h"
#include "core/log.h"

DiagDeviceHandler::DiagDeviceHandler(const android::String8& path, DataConsumer* consumer,
                                     LogController* ctrl, Multiplexer* mux)
    : DeviceFileHandler(path, BUFFER_SIZE, ctrl, mux), m_consumer(consumer) {}

DiagDeviceHandler::DiagDeviceHandler(int fd, DataConsumer* consumer, LogController* ctrl,
                                     Multiplexer* mux)
    : DeviceFileHandler(fd, BUFFER_SIZE, ctrl, mux), m_consumer(consumer) {}

bool DiagDeviceHandler::process_data(DataBuffer& buf) {
    if (!m_consumer) {
        err_log("No data consumer for %s", path().string());
        return true;
    }
    return m_consumer->process(buf);
}
