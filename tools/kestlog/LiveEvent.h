// SPDX-License-Identifier: Apache-2.0
// Something that kestlog follow tells: an object for programs and a line for people.
#ifndef KESTLOG_LIVEEVENT_H_
#define KESTLOG_LIVEEVENT_H_

#include <nlohmann/json.hpp>
#include <string>

#include "kestlog/Report.h"

struct LiveEvent {
    // An object with this "event" and the time of the workstation. where: the medium and the CP,
    // for people; may be empty. words: escaped already.
    LiveEvent(const char* event, const std::string& where, const std::string& words);
    // Something about kestlog's own work.
    static LiveEvent notice(const std::string& words);

    Json json;
    std::string line;  // without a line feed
};

// "1.5 MB", with the units of 1024 that the quotas have.
std::string size_text(uint64_t bytes);
// "1 set", "3 sets".
std::string count_text(uint64_t count, const std::string& noun);
// "3 files (1.5 MB)".
std::string files_text(uint64_t files, uint64_t bytes);

#endif  // KESTLOG_LIVEEVENT_H_
