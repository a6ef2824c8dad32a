// SPDX-License-Identifier: Apache-2.0
// What the name of a file in the log tree says about the file. The service's own parsers
// are lenient; here a name must be exactly one that the service creates, and any other
// name says nothing.
#ifndef KESTLOG_FILENAME_H_
#define KESTLOG_FILENAME_H_

#include <string>

#include "config/CpType.h"
#include "storage/log_name.h"

constexpr char DATABASE_NAME[] = "modem_db.gz";
constexpr char DIGEST_NAME[] = "sha1.txt";

struct FileName {
    explicit FileName(const std::string& name);

    // A modem's log files begin with a time record, and its dump consists of frames.
    bool of_modem() const { return cp_type >= CT_WCDMA && cp_type <= CT_5MODE; }
    bool is_log() const { return type == LT_LOG; }
    // Something that is saved when a CP crashes.
    bool is_crash() const { return type == LT_DUMP || type == LT_MINI_DUMP || type == LT_IPC_INFO; }

    std::string text;
    bool exact = false;  // the name is one that the service creates
    bool aside = false;  // has the "-N" of a file that was set aside for a namesake
    LogType type = LT_UNKNOWN;
    const char* kind = "unknown";  // in words; a memory dump and its substitute differ
    bool framed_dump = false;      // a memory dump as received over the diag device
    std::string cp;                // name in it, or ""
    CpType cp_type = CT_UNKNOWN;
    uint32_t number = 0;  // of a log file
    LogTime time;
};

bool has_time(const LogTime& time);
// "2016-03-01 09:15:00", or "-" without a time.
std::string time_text(const LogTime& time);

// Whether it is a file or directory that a PC leaves on every card, or a meta file that kestlog
// has written beside a capture.
bool is_foreign_name(const std::string& name);

// Whether it is the name of a set directory; stores its time.
bool parse_set_name(const std::string& name, LogTime* time);

CpType cp_type_of(const std::string& cp);

#endif  // KESTLOG_FILENAME_H_
