// SPDX-License-Identifier: Apache-2.0

#include "kestctl/Output.h"

#include <stdio.h>
#include <time.h>

#include <algorithm>

#include "common/text.h"
#include "kestctl/ExitStatus.h"

namespace {

bool print(const std::string& line) {
    printf("%s\n", line.c_str());
    return fflush(stdout) == 0 && !ferror(stdout);
}

std::string json_value(const std::string& value) {
    return is_number(value) ? value : json_string(value);
}

// "2026-03-01T09:15:00+0100"
std::string time_now() {
    const time_t now = time(nullptr);
    struct tm local = {};
    localtime_r(&now, &local);
    char text[sizeof("2026-03-01T09:15:00+0100") + 16];
    strftime(text, sizeof(text), "%FT%T%z", &local);
    return text;
}

void print_rows(const char* prefix, const Output::Table& table) {
    for (const auto& row : table) {
        printf("%-16s %s%s\n", (prefix + row.first).c_str(), escape_text(row.second).c_str(),
               is_number(row.second) ? " MB" : "");
    }
}

std::string json_object(const Output::Table& table) {
    std::string object = "{";
    for (const auto& row : table) {
        object +=
            (object.size() == 1 ? "" : ",") + json_string(row.first) + ":" + json_value(row.second);
    }
    return object + "}";
}

}  // namespace

void Output::ok() const {
    print(m_json ? "{\"ok\":true}" : "OK");
}

void Output::value(const std::string& value) const {
    print(m_json ? "{\"ok\":true,\"value\":" + json_value(value) + "}" : escape_text(value));
}

bool Output::notification(const Notification& notification) const {
    const std::string time = m_timed ? time_now() : "";
    if (!m_json) {
        return print((m_timed ? time + " " : "") + notification.event() + " " +
                     escape_text(notification.cp));
    }
    const char* const event = notification.start ? "DUMP_START" : "DUMP_END";
    return print(std::string("{\"event\":\"") + event +
                 "\",\"cp\":" + json_string(notification.cp) +
                 (m_timed ? ",\"time\":" + json_string(time) : "") + "}");
}

void Output::status(const Table& settings, const Table& logs, const Table& iqs) const {
    if (!m_json) {
        print_rows("", settings);
        print_rows("log ", logs);
        print_rows("iq ", iqs);
        fflush(stdout);
        return;
    }
    std::string object = "{\"ok\":true";
    for (const auto& row : settings) {
        std::string name = row.first;
        std::replace(name.begin(), name.end(), '-', '_');
        object += "," + json_string(name) + ":" + json_value(row.second);
    }
    print(object + ",\"log\":" + json_object(logs) + ",\"iq\":" + json_object(iqs) + "}");
}

void Output::remark(const std::string& words) const {
    fprintf(stderr, "kestctl: %s\n", escape_text(words).c_str());
}

void Output::line(const std::string& line) const {
    print(escape_text(line));
}

int Output::error_reply(int code) const {
    fprintf(stderr, "kestctl: error %d: %s\n", code, error_meaning(code));
    if (m_json) {
        print("{\"ok\":false,\"code\":" + std::to_string(code) +
              ",\"meaning\":" + json_string(error_meaning(code)) + "}");
    }
    return ES_SERVICE_ERROR + code;
}

int Output::failure(int status, const std::string& words) const {
    remark(words);
    if (m_json) {
        print("{\"ok\":false,\"status\":" + std::to_string(status) +
              ",\"meaning\":" + json_string(words) + "}");
    }
    return status;
}
