// SPDX-License-Identifier: Apache-2.0
// The record that heads every log file of a modem: it pairs the CP's time base with
// the time of day, so that a decoder can place the CP's own time. 16 bytes,
// little-endian.
#ifndef CHANNELS_TIMESYNCRECORD_H_
#define CHANNELS_TIMESYNCRECORD_H_

#include <stddef.h>
#include <stdint.h>

constexpr uint32_t TIME_SYNC_MAGIC = 0x12345678;

// What the time service answers.
constexpr size_t TIME_SYNC_REPLY_LEN = 12;

struct TimeSyncRecord {
    uint32_t magic;
    uint32_t seconds;    // local time: the service's UTC seconds plus the zone's whole hours
    uint8_t cp_time[8];  // the rest of the reply, as received
};
static_assert(sizeof(TimeSyncRecord) == 16, "TimeSyncRecord is 16 bytes on the medium");

// The record for a reply of the time service in a zone that many hours from UTC.
TimeSyncRecord make_time_sync_record(const uint8_t (&reply)[TIME_SYNC_REPLY_LEN], int zone_hours);

// Local time minus UTC in whole hours, -12 to 12; 0 when it cannot be found.
int time_zone_hours();

#endif  // CHANNELS_TIMESYNCRECORD_H_
