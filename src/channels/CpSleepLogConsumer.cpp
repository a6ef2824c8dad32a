// SPDX-License-Identifier: Apache-2.0

#include "channels/CpSleepLogConsumer.h"

#include "core/log.h"

const DiagReplyConsumer::Exchange CpSleepLogConsumer::EXCHANGE = {
    0x3B, "sleeplog", LT_SLEEP_LOG, LPR_SLEEPLOG_NO_SUPPORT, sleep_log_read_timeout};

CpSleepLogConsumer::CpSleepLogConsumer(const char* cp_name, CpStorage* storage)
    : DiagReplyConsumer(cp_name, storage, EXCHANGE) {}

int CpSleepLogConsumer::start() {
    return start_exchange(open_file());
}

LogFile* CpSleepLogConsumer::open_file() {
    android::String8 name;
    LogFile* file = nullptr;
    if (create_result_file(name, file) && !file) {
        err_log("open sleep log file %s failed", name.string());
    }
    return file;
}

void CpSleepLogConsumer::sleep_log_read_timeout(void* param) {
    CpSleepLogConsumer* consumer = static_cast<CpSleepLogConsumer*>(param);
    if (!consumer->end_by_timeout()) {
        return;
    }
    err_log("read sleep log timeout");
    consumer->notify_result(LPR_FAILURE);
}
