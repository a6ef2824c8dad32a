// SPDX-License-Identifier: Apache-2.0
// Asks the CP time service, a local server of the handset, for the time that heads a log
// file. Made for one question. It blocks, but not for much longer than a second, whatever
// the service does. Logs nothing.
#ifndef CHANNELS_TIMESYNCCLIENT_H_
#define CHANNELS_TIMESYNCCLIENT_H_

#include <stdint.h>

#include "channels/TimeSyncRecord.h"

class TimeSyncClient {
public:
    // Why there is no reply.
    enum Fault : int {
        TSF_NONE = 0,
        TSF_NO_CONNECTION,
        TSF_NO_FLAGS,       // those of the connection can not be read
        TSF_FLAGS_NOT_SET,  // the connection stays blocking
        TSF_NO_REPLY        // none in time, or a short one
    };

    TimeSyncClient() = default;
    // Disconnects; errno stays.
    ~TimeSyncClient();
    TimeSyncClient(const TimeSyncClient&) = delete;
    TimeSyncClient& operator=(const TimeSyncClient&) = delete;

    // Connects, waits for the reply and reads it. A fault leaves its errno.
    Fault ask(uint8_t (&reply)[TIME_SYNC_REPLY_LEN]);

private:
    static constexpr int PATIENCE_MS = 1000;  // for the connection and the reply
    static constexpr int ATTEMPT_MS = 100;    // between two attempts to connect

    bool connect();
    bool read_reply(uint8_t (&reply)[TIME_SYNC_REPLY_LEN]);

    int m_fd = -1;
    int m_left_ms = PATIENCE_MS;
};

#endif  // CHANNELS_TIMESYNCCLIENT_H_
