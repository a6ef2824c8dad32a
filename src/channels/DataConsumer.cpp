// SPDX-License-Identifier: Apache-2.0

#include "channels/DataConsumer.h"

#include <poll.h>

#include "core/OneShotTimer.h"

DataConsumer::DataConsumer(const char* cp_name, CpStorage* storage)
    : m_cp_name(cp_name), m_storage(storage) {}

DataConsumer::~DataConsumer() {}

void DataConsumer::set_callback(void* client, trans_result_callback callback) {
    m_client = client;
    m_callback = callback;
}

void DataConsumer::notify_result(LogProcResult result) {
    if (m_callback) {
        m_callback(m_client, result);
    }
}

bool DataConsumer::data_waits() const {
    struct pollfd pfd;
    pfd.fd = m_handler->fd();
    pfd.events = POLLIN;
    pfd.revents = 0;
    // A device that hung up or failed is readable as well, for ever and without data.
    return poll(&pfd, 1, 0) > 0 && pfd.revents == POLLIN;
}

bool DataConsumer::goes_on(OneShotTimer& read_timer, unsigned int timeout_ms) {
    if (!data_waits() || read_timer.start(timeout_ms) < 0) {
        return false;
    }
    // Once only: a device may be readable for ever and yet give nothing.
    const ObjectRef<DataConsumer> self(this);
    m_handler->process(POLLIN);
    if (!self || m_handler->idle_wakeups() == 0) {
        return true;
    }
    read_timer.stop();
    return false;
}
