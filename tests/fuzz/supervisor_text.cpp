// SPDX-License-Identifier: Apache-2.0
// What a supervisor sends: every read gives one line in the log, of limited length and
// without control bytes; an event comes exactly when a pattern is there.
#include <ctype.h>
#include <cutils/sockets.h>
#include <poll.h>
#include <sys/socket.h>

#include <algorithm>
#include <regex>

#include "control/LogController.h"
#include "fuzz/fuzz.h"
#include "state/ExtWcnStateHandler.h"
#include "state/ModemStateHandler.h"
#include "support/TestRoot.h"

namespace {

constexpr char SERVER[] = "supervisor_fuzz";

// A controller without channels: an event only makes it log.
struct Service {
    TestRoot root;
    LogController ctrl;
    const int server = socket_local_server(SERVER, ANDROID_SOCKET_NAMESPACE_ABSTRACT, SOCK_STREAM);
};

bool is_event(bool wcn, const std::string& text) {
    static const std::regex MODEM("Modem (Assert|Alive|Blocked)");
    static const std::regex WCN("WCN-EXTERNAL-(ALIVE|DUMP)");
    return std::regex_search(text, wcn ? WCN : MODEM);
}

void check_log(const std::string& log, const std::string& sent, bool event) {
    const size_t end = log.find('\n');
    FUZZ_CHECK(end != std::string::npos && end <= 100 + 4 * sent.size());
    FUZZ_CHECK(log.find(std::to_string(sent.size()) + " bytes: ") < end);
    FUZZ_CHECK(std::all_of(log.begin(), log.begin() + static_cast<ptrdiff_t>(end),
                           [](char c) { return !iscntrl(static_cast<uint8_t>(c)) || c == '\t'; }));
    FUZZ_CHECK(event == (log.find("unknown MODEM type", end) != std::string::npos));
    FUZZ_CHECK(std::count(log.begin(), log.end(), '\n') == (event ? 2 : 1));
}

}  // namespace

// The first byte tells the kind of the supervisor and how much it sends at a time.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static Service service;
    if (size < 1) {
        return 0;
    }
    const bool wcn = data[0] & 1;
    const size_t piece = data[0] < 0x80 ? 256 : 1 + (data[0] & 0x7E);
    const std::string text = fuzz_text(data + 1, std::min<size_t>(size - 1, 1024));

    ModemStateHandler modem_state(&service.ctrl, &service.ctrl.multiplexer(), SERVER);
    ExtWcnStateHandler wcn_state(&service.ctrl, &service.ctrl.multiplexer(), SERVER);
    CpStateHandler& state = wcn ? static_cast<CpStateHandler&>(wcn_state) : modem_state;
    state.init();
    const int peer = accept(service.server, nullptr, nullptr);
    FUZZ_CHECK(peer >= 0 && state.fd() >= 0);
    LogCapture log;
    for (size_t pos = 0; pos < text.size(); pos += piece) {
        const std::string sent = text.substr(pos, piece);
        FUZZ_CHECK(write(peer, sent.data(), sent.size()) == static_cast<ssize_t>(sent.size()));
        log.clear();
        state.process(POLLIN);
        check_log(log.text(), sent, is_event(wcn, sent));
    }
    close(peer);
    return 0;
}
