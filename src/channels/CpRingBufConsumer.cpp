// SPDX-License-Identifier: Apache-2.0

#include "channels/CpRingBufConsumer.h"

#include "core/log.h"

const DiagReplyConsumer::Exchange CpRingBufConsumer::EXCHANGE = {
    0x3A, "ringbuf", LT_RINGBUF, LPR_RINGBUF_NO_SUPPORT, ring_buffer_read_timeout};

CpRingBufConsumer::CpRingBufConsumer(const char* cp_name, CpStorage* storage)
    : DiagReplyConsumer(cp_name, storage, EXCHANGE) {}

int CpRingBufConsumer::start() {
    return start_exchange(open_file());
}

LogFile* CpRingBufConsumer::open_file() {
    android::String8 name;
    LogFile* file = nullptr;
    if (create_result_file(name, file) && !file) {
        err_log("open ring buffer file %s failed", name.string());
    }
    return file;
}

void CpRingBufConsumer::ring_buffer_read_timeout(void* param) {
    CpRingBufConsumer* consumer = static_cast<CpRingBufConsumer*>(param);
    if (!consumer->end_by_timeout()) {
        return;
    }
    err_log("read ring buffer timeout");
    consumer->notify_result(LPR_FAILURE);
}
