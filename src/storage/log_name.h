// SPDX-License-Identifier: Apache-2.0
// The names of the files in a CP directory: what a name found on a medium tells
// about the file, and the texts of local times in names. Names on a card are input
// from strangers; every parser here stays within the length it is given.
#ifndef STORAGE_LOG_NAME_H_
#define STORAGE_LOG_NAME_H_

#include <stddef.h>
#include <stdint.h>
#include <time.h>
#include <utils/String8.h>

#include "storage/LogType.h"

// A time as written in names: year with century, month 1 to 12; all 0: unknown.
struct LogTime {
    int year = 0;
    int month = 0;
    int day = 0;
    int hour = 0;
    int minute = 0;
    int second = 0;

    static LogTime from_tm(const struct tm& t);
    // "2016-03-01_09-15-00", as file names have it, and "2016-03-01-09-15-00", as the names of
    // sets do.
    android::String8 file_stamp() const { return stamp('_'); }
    android::String8 set_stamp() const { return stamp('-'); }
    bool operator<(const LogTime& other) const;

private:
    android::String8 stamp(char middle) const;
};

// Kind of a file found on a medium, from its name; the time in the name, if it has
// one that counts, goes to time.
LogType parse_log_name(const char* name, size_t len, LogTime& time);

// The rotation number at the head of a log file's name: a digit run followed by "-".
// digits gets the length of the run. -1 when the name has none, or one that
// parse_leading_number refuses.
int parse_log_number(const android::String8& name, uint32_t& number, size_t& digits);

// The name with another number in place of the old_digits digits at its head.
android::String8 with_number(const android::String8& name, uint32_t number, size_t old_digits);

// The current local time; -1 when the clock or the conversion fails.
int get_local_time(struct tm& t);

#endif  // STORAGE_LOG_NAME_H_
