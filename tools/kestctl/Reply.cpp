// SPDX-License-Identifier: Apache-2.0

#include "kestctl/Reply.h"

#include <stdint.h>
#include <stdlib.h>
#include <string.h>

#include "kestctl/ExitStatus.h"

namespace {

const char OK[] = "OK";
const char OK_VALUE[] = "OK ";
const char ERROR[] = "ERROR ";
const char DUMP_START[] = "CP_DUMP_START ";
const char DUMP_END[] = "CP_DUMP_END ";

// With a larger one the exit status could be one that shells use themselves.
const long MAX_CODE = 99;

// Indexed by the code.
const char* const MEANINGS[MAX_ERROR_CODE + 1] = {
    "OK",
    "the service does not know the request",
    "a parameter is missing, malformed, unknown or unexpected, or the CP has no log channel",
    "the operation failed",
    "the service is busy: a dump or another request is running",
    "logging of that CP is disabled",
    "the CP does not support sleep log retrieval",
    "the CP does not support ring buffer retrieval",
    "the CP is not working",
    "not the name of a CP",
};

// Stores what follows the prefix; false when the prefix or the text after it is missing.
bool after(const std::string& line, const char* prefix, std::string* rest) {
    const size_t len = strlen(prefix);
    if (line.size() <= len || line.compare(0, len, prefix) != 0) {
        return false;
    }
    *rest = line.substr(len);
    return true;
}

}  // namespace

const char* error_meaning(int code) {
    return code >= 1 && code <= MAX_ERROR_CODE ? MEANINGS[code] : "unknown error code";
}

bool is_number(const std::string& text) {
    return !text.empty() && text.size() <= 10 &&
           text.find_first_not_of("0123456789") == std::string::npos &&
           (text == "0" || text[0] != '0') && strtoull(text.c_str(), nullptr, 10) <= UINT32_MAX;
}

bool parse_reply(const std::string& line, Reply* reply) {
    *reply = Reply();
    if (line == OK || after(line, OK_VALUE, &reply->value)) {
        return true;
    }
    std::string code;
    if (!after(line, ERROR, &code) || !is_number(code)) {
        return false;
    }
    const long number = strtol(code.c_str(), nullptr, 10);
    if (number < 1 || number > MAX_CODE) {
        return false;
    }
    reply->code = static_cast<int>(number);
    return true;
}

bool parse_notification(const std::string& line, Notification* notification) {
    notification->start = after(line, DUMP_START, &notification->cp);
    return notification->start || after(line, DUMP_END, &notification->cp);
}
