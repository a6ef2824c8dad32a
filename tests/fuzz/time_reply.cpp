// SPDX-License-Identifier: Apache-2.0
// The time service's reply becomes the record at the head of a log file, byte by byte.
#include <string.h>

#include "channels/TimeSyncRecord.h"
#include "fuzz/fuzz.h"

// The first byte tells the zone, the next twelve are the reply.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    uint8_t reply[TIME_SYNC_REPLY_LEN];
    if (size < 1 + sizeof(reply)) {
        return 0;
    }
    const int zone = data[0] % 25 - 12;
    memcpy(reply, data + 1, sizeof(reply));
    const TimeSyncRecord record = make_time_sync_record(reply, zone);
    uint32_t seconds = 0;
    for (size_t i = 4; i > 0; --i) {
        seconds = seconds << 8 | reply[i - 1];
    }
    FUZZ_CHECK(record.magic == 0x12345678);
    FUZZ_CHECK(record.seconds == seconds + 3600u * static_cast<uint32_t>(zone));
    FUZZ_CHECK(memcmp(record.cp_time, reply + 4, 8) == 0);
    return 0;
}
