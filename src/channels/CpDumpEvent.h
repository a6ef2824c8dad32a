// SPDX-License-Identifier: Apache-2.0
// What subscribed control clients are told about a CP's memory dump.
#ifndef CHANNELS_CPDUMPEVENT_H_
#define CHANNELS_CPDUMPEVENT_H_

enum CpDumpEvent : int { CDE_START = 0, CDE_END = 1 };

#endif  // CHANNELS_CPDUMPEVENT_H_
