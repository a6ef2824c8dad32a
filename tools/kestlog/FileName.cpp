// SPDX-License-Identifier: Apache-2.0

#include "kestlog/FileName.h"

#include <stdio.h>
#include <string.h>
#include <strings.h>

#include <algorithm>

namespace {

constexpr size_t STAMP_LEN = 19;

struct Form {
    LogType type;
    const char* kind;
    const char* head;  // before the time
    const char* tail;  // after it
    bool cp;           // the CP's name stands before the head
    bool stamp;
};

// clang-format off
constexpr Form FORMS[] = {
    {LT_LOG,       "log",         "-",          ".log",     true,  true},
    {LT_DUMP,      "memory dump", "_memory_",   ".dmp",     true,  true},
    {LT_DUMP,      "memory copy", "_memory_",   ".mem",     true,  true},
    {LT_RINGBUF,   "ring buffer", "_ringbuf_",  ".log",     true,  true},
    {LT_SLEEP_LOG, "sleep log",   "_sleeplog_", ".log",     true,  true},
    {LT_WCDMA_IQ,  "I/Q samples", "_wiq_",      ".bin",     true,  true},
    {LT_VERSION,   "version",     "",           ".version", true,  false},
    {LT_MINI_DUMP, "mini dump",   "mini_dump_", ".bin",     false, true},
    {LT_IPC_INFO,  "IPC record",  "smsg_",      ".log",     false, true},
    {LT_IPC_INFO,  "IPC record",  "sbuf_",      ".log",     false, true},
    {LT_IPC_INFO,  "IPC record",  "sblock_",    ".log",     false, true},
};
// clang-format on

bool in_calendar(const LogTime& t) {
    return t.month >= 1 && t.month <= 12 && t.day >= 1 && t.day <= 31 && t.hour <= 23 &&
           t.minute <= 59 && t.second <= 60;
}

// Parses a time as it stands in file names.
bool parse_stamp(const std::string& text, LogTime* time) {
    const std::string name = "0-" + text;
    return parse_log_name(name.data(), name.size(), *time) == LT_LOG;
}

bool cut_tail(std::string* text, const std::string& tail) {
    if (text->size() < tail.size() ||
        text->compare(text->size() - tail.size(), tail.size(), tail) != 0) {
        return false;
    }
    text->resize(text->size() - tail.size());
    return true;
}

// Removes the rotation number from the start.
bool cut_number(std::string* text, uint32_t* number) {
    size_t digits;
    if (parse_log_number(android::String8(text->c_str()), *number, digits) < 0) {
        return false;
    }
    const bool exact = text->compare(0, digits, std::to_string(*number)) == 0;
    text->erase(0, digits + 1);
    return exact;
}

// Removes the time from the end.
bool cut_stamp(std::string* text, LogTime* time) {
    const std::string last = text->substr(text->size() - std::min(text->size(), STAMP_LEN));
    if (!parse_stamp(last, time) || !in_calendar(*time) || time->file_stamp() != last.c_str()) {
        return false;
    }
    text->resize(text->size() - STAMP_LEN);
    return true;
}

// Removes the "-N" of a file that was set aside for a newer namesake from the end.
bool cut_aside(std::string* text) {
    const size_t dash = text->find_last_not_of("0123456789");
    if (dash == std::string::npos || (*text)[dash] != '-' || dash + 1 == text->size() ||
        (*text)[dash + 1] == '0') {
        return false;
    }
    text->resize(dash);
    return true;
}

bool match(const Form& form, FileName* name) {
    std::string rest = name->text;
    LogTime time;
    if (!cut_tail(&rest, form.tail)) {
        return false;
    }
    bool aside = false;
    if (form.stamp && !cut_stamp(&rest, &time)) {
        aside = cut_aside(&rest);
        if (!aside || !cut_stamp(&rest, &time)) {
            return false;
        }
    }
    uint32_t number = 0;
    if (!cut_tail(&rest, form.head) || (form.type == LT_LOG && !cut_number(&rest, &number)) ||
        (form.cp ? cp_type_of(rest) == CT_UNKNOWN : !rest.empty())) {
        return false;
    }
    name->aside = aside;
    name->type = form.type;
    name->kind = form.kind;
    name->cp = rest;
    name->cp_type = cp_type_of(rest);
    name->number = number;
    name->time = time;
    return true;
}

}  // namespace

FileName::FileName(const std::string& name) : text(name) {
    if (name == DATABASE_NAME || name == DIGEST_NAME) {
        kind = name == DIGEST_NAME ? "database digest" : "parsing database";
        exact = true;
        return;
    }
    for (const Form& form : FORMS) {
        if (match(form, this)) {
            exact = true;
            framed_dump = of_modem() && strcmp(form.tail, ".dmp") == 0;
            return;
        }
    }
}

bool is_foreign_name(const std::string& name) {
    std::string stem = name;
    static const char* const NAMES[] = {
        ".DS_Store",   ".Trashes",  ".fseventsd", ".Spotlight-V100",           "$RECYCLE.BIN",
        "desktop.ini", "Thumbs.db", "LOST.DIR",   "System Volume Information", "lost+found",
    };
    return name.compare(0, 2, "._") == 0 || cut_tail(&stem, ".sigmf-meta") ||
           std::any_of(std::begin(NAMES), std::end(NAMES), [&](const char* foreign) {
               return strcasecmp(foreign, name.c_str()) == 0;  // as on a FAT
           });
}

bool has_time(const LogTime& time) {
    return LogTime() < time;
}

std::string time_text(const LogTime& time) {
    if (!in_calendar(time)) {
        return "-";
    }
    std::string text = time.file_stamp().string();
    text[10] = ' ';
    text[13] = text[16] = ':';
    return text;
}

bool parse_set_name(const std::string& name, LogTime* time) {
    return name.size() == STAMP_LEN && parse_stamp(name, time) && in_calendar(*time) &&
           time->set_stamp() == name.c_str();
}

CpType cp_type_of(const std::string& cp) {
    return cp_type_from_name(cp.data(), cp.size());
}
