// SPDX-License-Identifier: Apache-2.0

#include "state/ExtWcnStateHandler.h"

ExtWcnStateHandler::ExtWcnStateHandler(LogController* ctrl, Multiplexer* mux, const char* serv_name)
    : CpStateHandler(ctrl, mux, serv_name) {}

ExtWcnStateHandler::~ExtWcnStateHandler() = default;

CpStateHandler::CpEvent ExtWcnStateHandler::parse_notify(const uint8_t* buf, size_t len,
                                                         CpType& type) {
    static const Pattern patterns[] = {{"WCN-EXTERNAL-ALIVE", CE_ALIVE},
                                       {"WCN-EXTERNAL-DUMP", CE_ASSERT}};
    const CpEvent event = find_event(buf, len, patterns);
    if (event != CE_NONE) {
        type = CT_WCN;
    }
    return event;
}
