// SPDX-License-Identifier: Apache-2.0

#include "storage/log_name.h"

#include <string.h>

#include <tuple>

#include "core/text.h"

namespace {

// Length of "2016-03-01_09-15-00"; its digit fields stand at fixed offsets; the
// characters between them are not examined.
constexpr size_t TIMESTAMP_LEN = 19;

bool digits_at(const char* text, size_t num) {
    for (size_t i = 0; i < num; ++i) {
        if (text[i] < '0' || text[i] > '9') {
            return false;
        }
    }
    return true;
}

bool parse_field(const char* text, size_t num, int& value) {
    if (!digits_at(text, num)) {
        return false;
    }
    value = 0;
    for (size_t i = 0; i < num; ++i) {
        value = value * 10 + (text[i] - '0');
    }
    return true;
}

bool parse_timestamp(const char* text, size_t len, LogTime& time) {
    LogTime t;
    if (len < TIMESTAMP_LEN || !parse_field(text, 4, t.year) ||
        !parse_field(text + 5, 2, t.month) || !parse_field(text + 8, 2, t.day) ||
        !parse_field(text + 11, 2, t.hour) || !parse_field(text + 14, 2, t.minute) ||
        !parse_field(text + 17, 2, t.second)) {
        return false;
    }
    time = t;
    return true;
}

// A timestamp anywhere in the text.
bool find_timestamp(const char* text, size_t len, LogTime& time) {
    for (size_t i = 0; i + TIMESTAMP_LEN <= len; ++i) {
        if (parse_timestamp(text + i, len - i, time)) {
            return true;
        }
    }
    return false;
}

bool ends_with(const char* text, size_t len, const char* suffix) {
    const size_t n = strlen(suffix);
    return len >= n && memcmp(text + len - n, suffix, n) == 0;
}

// A memory dump's timestamp follows the first "_" that has four digits after it.
bool find_dump_time(const char* name, size_t len, LogTime& time) {
    for (size_t i = 0; i + 5 <= len; ++i) {
        if (name[i] == '_' && digits_at(name + i + 1, 4)) {
            return parse_timestamp(name + i + 1, len - i - 1, time);
        }
    }
    return false;
}

struct PrefixRule {
    const char* prefix;
    LogType type;
};

// Names whose timestamp follows directly after the prefix.
constexpr PrefixRule PREFIX_RULES[] = {
    {"mini_dump_", LT_MINI_DUMP},
    {"sblock_", LT_IPC_INFO},
    {"sbuf_", LT_IPC_INFO},
    {"smsg_", LT_IPC_INFO},
};

}  // namespace

LogTime LogTime::from_tm(const struct tm& t) {
    LogTime time;
    time.year = t.tm_year + 1900;
    time.month = t.tm_mon + 1;
    time.day = t.tm_mday;
    time.hour = t.tm_hour;
    time.minute = t.tm_min;
    time.second = t.tm_sec;
    return time;
}

android::String8 LogTime::stamp(char middle) const {
    return android::String8::format("%04d-%02d-%02d%c%02d-%02d-%02d", year, month, day, middle,
                                    hour, minute, second);
}

bool LogTime::operator<(const LogTime& other) const {
    return std::tie(year, month, day, hour, minute, second) <
           std::tie(other.year, other.month, other.day, other.hour, other.minute, other.second);
}

LogType parse_log_name(const char* name, size_t len, LogTime& time) {
    if (len > 0 && digits_at(name, 1)) {
        // A run of any length: a number too large to be raised is still a log file's.
        size_t digits = 1;
        while (digits < len && digits_at(name + digits, 1)) {
            ++digits;
        }
        if (digits == len || name[digits] != '-') {
            return LT_UNKNOWN;
        }
        return find_timestamp(name + digits + 1, len - digits - 1, time) ? LT_LOG : LT_UNKNOWN;
    }
    if (ends_with(name, len, ".version")) {
        return LT_VERSION;
    }
    if (ends_with(name, len, ".dmp")) {
        return find_dump_time(name, len, time) ? LT_DUMP : LT_UNKNOWN;
    }
    for (const PrefixRule& rule : PREFIX_RULES) {
        const size_t n = strlen(rule.prefix);
        if (len >= n && memcmp(name, rule.prefix, n) == 0) {
            return parse_timestamp(name + n, len - n, time) ? rule.type : LT_UNKNOWN;
        }
    }
    return LT_UNKNOWN;
}

int parse_log_number(const android::String8& name, uint32_t& number, size_t& digits) {
    const char* text = name.string();
    const size_t len = name.length();
    if (parse_leading_number(reinterpret_cast<const uint8_t*>(text), len, number, digits) < 0 ||
        digits == len || text[digits] != '-') {
        return -1;
    }
    return 0;
}

android::String8 with_number(const android::String8& name, uint32_t number, size_t old_digits) {
    android::String8 result = android::String8::format("%u", number);
    result.append(name.string() + old_digits);
    return result;
}

int get_local_time(struct tm& t) {
    const time_t now = time(nullptr);
    if (now == static_cast<time_t>(-1) || !localtime_r(&now, &t)) {
        return -1;
    }
    return 0;
}
