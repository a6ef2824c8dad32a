// SPDX-License-Identifier: Apache-2.0

#include "channels/TimeSyncRecord.h"

#include <string.h>
#include <time.h>

TimeSyncRecord make_time_sync_record(const uint8_t (&reply)[TIME_SYNC_REPLY_LEN], int zone_hours) {
    TimeSyncRecord record;
    uint32_t seconds;
    memcpy(&seconds, reply, sizeof(seconds));
    record.magic = TIME_SYNC_MAGIC;
    record.seconds = seconds + static_cast<uint32_t>(3600 * zone_hours);
    memcpy(record.cp_time, reply + sizeof(seconds), sizeof(record.cp_time));
    return record;
}

int time_zone_hours() {
    const time_t now = time(nullptr);
    struct tm utc;
    struct tm local;
    if (now == static_cast<time_t>(-1) || !gmtime_r(&now, &utc) || !localtime_r(&now, &local)) {
        return 0;
    }
    const int hours = local.tm_hour - utc.tm_hour;
    if (hours > 12) {
        return hours - 24;
    }
    return hours < -12 ? hours + 24 : hours;
}
