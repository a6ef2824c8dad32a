// SPDX-License-Identifier: Apache-2.0
// Connection to the supervisor of the external WCN chip. Owned by the LogController.
#ifndef STATE_EXTWCNSTATEHANDLER_H_
#define STATE_EXTWCNSTATEHANDLER_H_

#include "state/CpStateHandler.h"

class ExtWcnStateHandler : public CpStateHandler {
public:
    ExtWcnStateHandler(LogController* ctrl, Multiplexer* mux, const char* serv_name);
    ~ExtWcnStateHandler() override;

    // Sets type only with an event.
    CpEvent parse_notify(const uint8_t* buf, size_t len, CpType& type) override;
};

#endif  // STATE_EXTWCNSTATEHANDLER_H_
