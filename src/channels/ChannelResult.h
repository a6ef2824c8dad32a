// SPDX-License-Identifier: Apache-2.0
// What the operations of a channel, and of the controller on channels, come to. They return
// int: 0 for success, one of these otherwise; a reply code of the control socket stands for
// each failure.
#ifndef CHANNELS_CHANNELRESULT_H_
#define CHANNELS_CHANNELRESULT_H_

enum ChannelResult : int {
    CR_STARTED = 1,  // a transaction runs, its result comes later
    CR_OK = 0,
    CR_FAILED = -1,
    CR_BUSY = -2,  // a dump or another transaction runs
    CR_LOG_DISABLED = -3,
    CR_NO_SLEEP_LOG = -4,  // the CP does not serve sleep logs
    CR_NO_RINGBUF = -5,    // the CP does not serve ring buffers
    CR_NOT_WORKING = -6,   // the CP has asserted
    CR_NO_CHANNEL = -7     // there is no channel of that type
};

#endif  // CHANNELS_CHANNELRESULT_H_
