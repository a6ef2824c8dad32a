// SPDX-License-Identifier: Apache-2.0
// Parsers for the lines that the service sends. The service is not trusted: a line that is
// not exactly a reply or a notification is rejected.
#ifndef KESTCTL_REPLY_H_
#define KESTCTL_REPLY_H_

#include <string>

struct Reply {
    int code = 0;       // 0: OK, otherwise the code of an error reply
    std::string value;  // what follows OK, or empty
};

// "OK", "OK <value>" or "ERROR <code>", without the line feed. False for anything else.
bool parse_reply(const std::string& line, Reply* reply);

// A line that says that the memory dump of a CP has started or ended.
struct Notification {
    bool start = false;
    std::string cp;

    // As the service spells it.
    const char* event() const { return start ? "CP_DUMP_START" : "CP_DUMP_END"; }
};

bool parse_notification(const std::string& line, Notification* notification);

// A decimal number as the service prints one: digits without leading zeros, up to 32 bits.
bool is_number(const std::string& text);

#endif  // KESTCTL_REPLY_H_
