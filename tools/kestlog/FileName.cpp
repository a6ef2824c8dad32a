// SPDX-License-Identifier: Apache-2.0

#include "kestlog/FileName.h"

#include <stdio.h>
#include <string.h>
#include <strings.h>

#include <algorithm>
#include <charconv>

#include "common/text.h"

namespace {

constexpr size_t STAMP_LEN = 19;
constexpr char DIGITS[] = "0123456789";

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
    {LT_UNKNOWN,   "unknown",     "",           "",         false, false},  // any other name
    {LT_LOG,       "log",         "-",          LOG_ENDING,     true,  true},
    {LT_DUMP,      "memory dump", "_memory_",   ".dmp",     true,  true},
    {LT_DUMP,      "memory copy", "_memory_",   ".mem",     true,  true},
    {LT_RINGBUF,   "ring buffer", "_ringbuf_",  ".log",     true,  true},
    {LT_SLEEP_LOG, "sleep log",   "_sleeplog_", ".log",     true,  true},
    {LT_WCDMA_IQ,  "I/Q samples", "_wiq_",      ".bin",     true,  true},
    {LT_VERSION,   "version",     "",           VERSION_ENDING, true,  false},
    {LT_MINI_DUMP, "mini dump",   "mini_dump_", ".bin",     false, true},
    {LT_IPC_INFO,  "IPC record",  "smsg_",      ".log",     false, true},
    {LT_IPC_INFO,  "IPC record",  "sbuf_",      ".log",     false, true},
    {LT_IPC_INFO,  "IPC record",  "sblock_",    ".log",     false, true},
    {LT_UNKNOWN, "parsing database", DATABASE_NAME, "",     false, false},
    {LT_UNKNOWN, "database digest",  DIGEST_NAME,   "",     false, false},
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

// Removes the "-N" of a file that was set aside for a newer namesake from the end. An N that is
// too large for 32 bits becomes the largest.
bool cut_aside(std::string* text, uint32_t* aside) {
    const size_t dash = text->find_last_not_of(DIGITS);
    if (dash == std::string::npos || (*text)[dash] != '-' || dash + 1 == text->size() ||
        (*text)[dash + 1] == '0') {
        return false;
    }
    const char* const end = text->data() + text->size();
    if (std::from_chars(text->data() + dash + 1, end, *aside).ec != std::errc()) {
        *aside = UINT32_MAX;
    }
    text->resize(dash);
    return true;
}

}  // namespace

ShortTime::ShortTime(const LogTime& time)
    : m_year(static_cast<int16_t>(std::clamp<int>(time.year, INT16_MIN, INT16_MAX))),
      m_month(static_cast<uint8_t>(time.month)),
      m_day(static_cast<uint8_t>(time.day)),
      m_hour(static_cast<uint8_t>(time.hour)),
      m_minute(static_cast<uint8_t>(time.minute)),
      m_second(static_cast<uint8_t>(time.second)) {}

FileName::FileName(const std::string& name) {
    for (size_t form = 1; form < std::size(FORMS) && !exact; ++form) {
        exact = match(form, name);
    }
    if (own_text() != name) {
        m_text = std::make_shared<const std::string>(name);
    }
}

bool FileName::match(size_t index, const std::string& name) {
    const Form& form = FORMS[index];
    std::string rest = name;
    LogTime time;
    if (!cut_ending(&rest, form.tail)) {
        return false;
    }
    uint32_t aside = 0;
    if (form.stamp && !cut_stamp(&rest, &time) &&
        (!cut_aside(&rest, &aside) || !cut_stamp(&rest, &time))) {
        return false;
    }
    uint32_t log_number = 0;
    if (!cut_ending(&rest, form.head) || (form.type == LT_LOG && !cut_number(&rest, &log_number)) ||
        (form.cp ? cp_type_of(rest) == CT_UNKNOWN : !rest.empty())) {
        return false;
    }
    m_form = static_cast<uint8_t>(index);
    m_time = ShortTime(time);
    m_aside = aside;
    type = form.type;
    cp_type = cp_type_of(rest);
    number = log_number;
    framed_dump = of_modem() && strcmp(form.tail, ".dmp") == 0;
    return true;
}

std::string FileName::own_text() const {
    const Form& form = FORMS[m_form];
    std::string name = form.type == LT_LOG ? std::to_string(number) + "-" : "";
    name.append(cp()).append(form.head);
    name += form.stamp ? time().file_stamp().string() : "";
    name += m_aside ? "-" + std::to_string(m_aside) : "";
    return name + form.tail;
}

const char* FileName::kind() const {
    return FORMS[m_form].kind;
}

std::string FileName::cp() const {
    return FORMS[m_form].cp ? cp_type_to_name(cp_type) : "";
}

bool is_foreign_name(const std::string& name) {
    std::string stem = name;
    static const char* const NAMES[] = {
        ".DS_Store",   ".Trashes",  ".fseventsd", ".Spotlight-V100",           "$RECYCLE.BIN",
        "desktop.ini", "Thumbs.db", "LOST.DIR",   "System Volume Information", "lost+found",
    };
    return name.compare(0, 2, "._") == 0 || cut_ending(&stem, SIGMF_ENDING) ||
           std::any_of(std::begin(NAMES), std::end(NAMES), [&](const char* foreign) {
               return strcasecmp(foreign, name.c_str()) == 0;  // as on a FAT
           });
}

bool has_time(const LogTime& time) {
    return LogTime() < time;
}

bool clock_was_set(const LogTime& time) {
    return time.year >= 2000;
}

void take_earlier(LogTime* first, const LogTime& time) {
    const bool set = clock_was_set(time);
    if (has_time(time) &&
        (!has_time(*first) || (set == clock_was_set(*first) ? time < *first : set))) {
        *first = time;
    }
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
