// SPDX-License-Identifier: Apache-2.0
// Who waits for the result of a channel's transaction, as the channel knows it. Not owned by
// the channel, which holds an ObjectRef: a waiter may go at any time.
#ifndef CHANNELS_TRANSCLIENT_H_
#define CHANNELS_TRANSCLIENT_H_

#include "core/ObjectRef.h"

class TransClient : public RefTarget {
public:
    // Called once when the transaction has ended: CR_OK, CR_FAILED, CR_NO_SLEEP_LOG or
    // CR_NO_RINGBUF.
    virtual void trans_ended(int result) = 0;

protected:
    ~TransClient() = default;
};

#endif  // CHANNELS_TRANSCLIENT_H_
