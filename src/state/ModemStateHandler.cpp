// SPDX-License-Identifier: Apache-2.0

#include "state/ModemStateHandler.h"

ModemStateHandler::ModemStateHandler(LogController* ctrl, Multiplexer* mux, const char* serv_name)
    : CpStateHandler(ctrl, mux, serv_name) {}

ModemStateHandler::~ModemStateHandler() = default;

CpStateHandler::CpEvent ModemStateHandler::parse_notify(const uint8_t* buf, size_t len,
                                                        CpType& type) {
    static const Pattern patterns[] = {{"TD Modem Assert", CE_ASSERT},
                                       {"Modem Assert", CE_ASSERT},
                                       {"Modem Alive", CE_ALIVE},
                                       {"Modem Blocked", CE_BLOCKED}};
    type = CT_WANMODEM;
    return find_event(buf, len, patterns);
}
