// SPDX-License-Identifier: Apache-2.0
// Connection to the supervisor of the cellular modem. Its events are for CT_WANMODEM,
// whichever modem the handset has. Owned by the LogController.
#ifndef STATE_MODEMSTATEHANDLER_H_
#define STATE_MODEMSTATEHANDLER_H_

#include "state/CpStateHandler.h"

class ModemStateHandler : public CpStateHandler {
public:
    ModemStateHandler(LogController* ctrl, Multiplexer* mux, const char* serv_name);
    ~ModemStateHandler() override;

    // Always sets type.
    CpEvent parse_notify(const uint8_t* buf, size_t len, CpType& type) override;
};

#endif  // STATE_MODEMSTATEHANDLER_H_
