// SPDX-License-Identifier: Apache-2.0
// kestctl's side of the control socket: whatever a service sends, every line comes out as it
// was, notifications apart, up to one that is too long or cut; nothing else is a reply.
#include <cutils/sockets.h>
#include <sys/socket.h>

#include <algorithm>
#include <regex>
#include <vector>

#include "core/system_paths.h"
#include "fuzz/fuzz.h"
#include "kestctl/ControlConnection.h"
#include "kestctl/ExitStatus.h"
#include "support/TestRoot.h"

namespace {

struct Service {
    TestRoot root;
    const int server =
        socket_local_server(SOCKET_CONTROL, ANDROID_SOCKET_NAMESPACE_ABSTRACT, SOCK_STREAM);
};

std::string text_of(const Notification& n) {
    return (n.start ? "CP_DUMP_START " : "CP_DUMP_END ") + n.cp;
}

// Whether it is a notification; if not, what kestctl takes for a reply is checked.
bool check_line(const std::string& line) {
    static const std::regex REPLY("OK|OK [^]+|ERROR [1-9][0-9]?");
    static const std::regex NOTIFICATION("CP_DUMP_(START|END) [^]+");
    Notification notification;
    const bool notified = parse_notification(line, &notification);
    FUZZ_CHECK(notified == std::regex_match(line, NOTIFICATION));
    FUZZ_CHECK(!notified || text_of(notification) == line);
    Reply reply;
    const bool valid = parse_reply(line, &reply);
    FUZZ_CHECK(valid == std::regex_match(line, REPLY));
    const std::string ok = reply.value.empty() ? "OK" : "OK " + reply.value;
    FUZZ_CHECK(!valid || line == (reply.code == 0 ? ok : "ERROR " + std::to_string(reply.code)));
    FUZZ_CHECK(reply.code == 0 || *error_meaning(reply.code));
    return notified;
}

typedef std::vector<std::string> Lines;

// What comes out of a text: its lines, and whether one that is too long ends it.
struct Lot {
    explicit Lot(const std::string& text) {
        for (size_t pos = 0; pos <= text.size() && !too_long;) {
            const size_t end = std::min(text.find('\n', pos), text.size());
            const std::string line = text.substr(pos, end - pos);
            too_long = line.size() > ControlConnection::MAX_LINE;
            if (!too_long && end < text.size()) {
                (check_line(line) ? notifications : replies).push_back(line);
            }
            pos = end + 1;
        }
    }
    Lines replies;
    Lines notifications;
    bool too_long = false;
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const Service service;
    const std::string text = fuzz_text(data, size);
    ControlConnection connection;
    Lines notifications;
    connection.set_listener([&](const Notification& n) {
        notifications.push_back(text_of(n));
        return true;
    });
    FUZZ_CHECK(connection.open(0) == ES_OK);
    const int peer = accept(service.server, nullptr, nullptr);
    // All of it and the end, before the first request is sent.
    FUZZ_CHECK(write(peer, text.data(), size) == static_cast<ssize_t>(size));
    shutdown(peer, SHUT_WR);

    Lines replies;
    std::string line;
    int status;
    while ((status = connection.request("GET_LOG_OVERWRITE", &line)) == ES_OK) {
        replies.push_back(line);
        char request[64];  // read, so that there is always room for the next one
        FUZZ_CHECK(recv(peer, request, sizeof(request), 0) > 0);
    }
    const Lot lot(text);
    FUZZ_CHECK(status == ES_BAD_REPLY && replies == lot.replies);
    FUZZ_CHECK(notifications == lot.notifications);
    FUZZ_CHECK((connection.failure().find("too long") != std::string::npos) == lot.too_long);
    close(peer);
    return 0;
}
