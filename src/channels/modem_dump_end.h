// SPDX-License-Identifier: Apache-2.0
// How a modem's memory dump ends: the payload of its last diag frame.
#ifndef CHANNELS_MODEM_DUMP_END_H_
#define CHANNELS_MODEM_DUMP_END_H_

#include <stddef.h>

constexpr char MODEM_DUMP_END[] = "\nmodem_memdump_finish";
constexpr size_t MODEM_DUMP_END_LEN = sizeof(MODEM_DUMP_END) - 1;

#endif  // CHANNELS_MODEM_DUMP_END_H_
