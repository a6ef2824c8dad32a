// SPDX-License-Identifier: Apache-2.0

#include "kestlog/LiveEvent.h"

#include <stdio.h>

#include "common/text.h"
#include "kestlog/FileName.h"

LiveEvent::LiveEvent(const char* event, const std::string& where, const std::string& words) {
    struct tm t;
    const std::string now = time_text(get_local_time(t) < 0 ? LogTime() : LogTime::from_tm(t));
    json = {{"event", event}, {"time", now}};
    line = now.substr(now.find(' ') + 1) + "  " + escape_text(where) + (where.empty() ? "" : "  ") +
           words;
}

LiveEvent LiveEvent::notice(const std::string& words) {
    LiveEvent event("notice", "", "kestlog: " + escape_text(words));
    event.json["meaning"] = json_text(words);
    return event;
}

std::string size_text(uint64_t bytes) {
    static const char* const UNITS[] = {"bytes", "KB", "MB", "GB", "TB"};
    double number = static_cast<double>(bytes);
    size_t unit = 0;
    while (number >= 1024 && unit + 1 < std::size(UNITS)) {
        number /= 1024;
        ++unit;
    }
    char text[32];
    snprintf(text, sizeof(text), "%.*f %s", unit ? 1 : 0, number, UNITS[unit]);
    return text;
}

std::string count_text(uint64_t count, const std::string& noun) {
    return std::to_string(count) + " " + noun + (count == 1 ? "" : "s");
}

std::string files_text(uint64_t files, uint64_t bytes) {
    return count_text(files, "file") + " (" + size_text(bytes) + ")";
}
