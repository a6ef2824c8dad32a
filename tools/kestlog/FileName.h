// SPDX-License-Identifier: Apache-2.0
// What the name of a file in the log tree says about the file. The service's own parsers
// are lenient; here a name must be exactly one that the service creates, and any other
// name says nothing.
#ifndef KESTLOG_FILENAME_H_
#define KESTLOG_FILENAME_H_

#include <stddef.h>
#include <stdint.h>

#include <memory>
#include <string>

#include "config/CpType.h"
#include "storage/log_name.h"

constexpr char DATABASE_NAME[] = "modem_db.gz";
constexpr char DIGEST_NAME[] = "sha1.txt";
// What the names of some files end with.
constexpr char LOG_ENDING[] = ".log";
constexpr char VERSION_ENDING[] = ".version";
constexpr char SIGMF_ENDING[] = ".sigmf-meta";

// A LogTime in a third of its space.
class ShortTime {
public:
    ShortTime() = default;
    explicit ShortTime(const LogTime& time);
    LogTime time() const { return {m_year, m_month, m_day, m_hour, m_minute, m_second}; }

private:
    int16_t m_year = 0;
    uint8_t m_month = 0, m_day = 0, m_hour = 0, m_minute = 0, m_second = 0;
};

// Small, as there is one for every file of a tree: a name that the service creates is not kept
// but put together again when it is asked for.
class FileName {
public:
    explicit FileName(const std::string& name);

    std::string text() const { return m_text ? *m_text : own_text(); }
    const char* kind() const;  // in words; a memory dump and its substitute differ
    std::string cp() const;    // the CP's name in it, or ""
    LogTime time() const { return m_time.time(); }
    // Has the "-N" of a file that was set aside for a namesake.
    bool aside() const { return m_aside != 0; }

    // A modem's log files begin with a time record, and its dump consists of frames.
    bool of_modem() const { return cp_type >= CT_WCDMA && cp_type <= CT_5MODE; }
    bool is_log() const { return type == LT_LOG; }
    // Something that is saved when a CP crashes.
    bool is_crash() const { return type == LT_DUMP || type == LT_MINI_DUMP || type == LT_IPC_INFO; }

    LogType type = LT_UNKNOWN;
    CpType cp_type = CT_UNKNOWN;
    uint32_t number = 0;       // of a log file
    bool exact = false;        // the name is one that the service creates
    bool framed_dump = false;  // a memory dump as received over the diag device

private:
    bool match(size_t form, const std::string& name);
    std::string own_text() const;

    uint8_t m_form = 0;
    ShortTime m_time;
    uint32_t m_aside = 0;                       // N, or 0
    std::shared_ptr<const std::string> m_text;  // of any other name
};

bool has_time(const LogTime& time);
// No handset is as old as what its clock shows before it is set.
bool clock_was_set(const LogTime& time);
// Makes *first the time if that is earlier. One of a clock that was not set counts only as long as
// there is no other.
void take_earlier(LogTime* first, const LogTime& time);
// "2016-03-01 09:15:00", or "-" without a time.
std::string time_text(const LogTime& time);

// Whether it is a file or directory that a PC leaves on every card, or a meta file that kestlog
// has written beside a capture.
bool is_foreign_name(const std::string& name);

// Whether it is the name of a set directory; stores its time.
bool parse_set_name(const std::string& name, LogTime* time);

CpType cp_type_of(const std::string& cp);

#endif  // KESTLOG_FILENAME_H_
