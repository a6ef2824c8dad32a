// SPDX-License-Identifier: Apache-2.0
// The requests of the control socket, one per row. Plain data, without the handlers:
// ClientHandler must have a handler for each row, kestctl derives its commands, help and
// completion from the rows, and tests compare the documents with them.
#ifndef CLIENT_REQUESTTABLE_H_
#define CLIENT_REQUESTTABLE_H_

#include <stddef.h>

#include <string_view>

// The most bytes of a request, without its terminator.
constexpr size_t MAX_REQUEST_LEN = 255;
// The most CPs that one request may list.
constexpr size_t MAX_REQUEST_CPS = 5;

// What answers a request that was carried out.
enum ReplyKind : int {
    RK_OK,      // OK at once
    RK_LATER,   // OK when the CP has delivered its data
    RK_NUMBER,  // OK and a number
    RK_WORD     // OK and a word
};

struct ControlRequest {
    const char* words;   // the keyword; of "kestctl" also the sub-command
    const char* params;  // what follows, in the notation of the documents
    ReplyKind reply;
    const char* help;  // one line

    constexpr std::string_view keyword() const {
        const std::string_view view = words;
        return view.substr(0, view.find(' '));
    }
};

// clang-format off
inline constexpr ControlRequest CONTROL_REQUESTS[] = {
    {"ENABLE_LOG",            "CP...",      RK_OK,     "log these CPs (five at most)"},
    {"DISABLE_LOG",           "CP...",      RK_OK,     "stop logging these CPs (five at most)"},
    {"GET_LOG_STATE",         "CP",         RK_WORD,   "print whether the CP is logged: ON or OFF"},
    {"SAVE_RINGBUF",          "CP",         RK_LATER,  "fetch the CP's ring buffer and save it"},
    {"SAVE_SLEEP_LOG",        "CP",         RK_LATER,  "fetch the CP's sleep log and save it"},
    {"FLUSH",                 "",           RK_OK,     "write out the log data that is still buffered"},
    {"kestctl reload",        "",           RK_OK,     "switch the CPs' logs as the general logger's configuration says"},
    {"kestctl clear",         "",           RK_OK,     "delete all CP logs on all media"},
    {"SET_LOG_FILE_SIZE",     "MB",         RK_OK,     "set the limit of one log file"},
    {"GET_LOG_FILE_SIZE",     "",           RK_NUMBER, "print that limit"},
    {"SET_DATA_MAX_SIZE",     "MB",         RK_OK,     "set the limit of the logs on the internal medium"},
    {"GET_DATA_MAX_SIZE",     "",           RK_NUMBER, "print that limit"},
    {"SET_SD_MAX_SIZE",       "MB",         RK_OK,     "set the limit of the logs on the SD card"},
    {"GET_SD_MAX_SIZE",       "",           RK_NUMBER, "print that limit"},
    {"ENABLE_LOG_OVERWRITE",  "",           RK_OK,     "at the limit, delete the oldest logs"},
    {"DISABLE_LOG_OVERWRITE", "",           RK_OK,     "at the limit, stop logging"},
    {"GET_LOG_OVERWRITE",     "",           RK_WORD,   "print which of the two applies: ENABLE or DISABLE"},
    {"SET_MD_STOR_POS",       "INTERNAL|EXTERNAL", RK_OK, "save mini dumps on the internal medium, or on the one in use"},
    {"GET_MD_STOR_POS",       "",           RK_WORD,   "print where mini dumps are saved: INTERNAL or EXTERNAL"},
    {"ENABLE_MD",             "",           RK_OK,     "save a mini dump when a CP crashes"},
    {"DISABLE_MD",            "",           RK_OK,     "do not save mini dumps"},
    {"MINI_DUMP",             "",           RK_OK,     "save a mini dump now (not supported)"},
    {"ENABLE_IQ",             "CP WCDMA",   RK_OK,     "capture the modem's I/Q samples"},
    {"DISABLE_IQ",            "CP [WCDMA]", RK_OK,     "stop capturing the modem's I/Q samples"},
    {"SUBSCRIBE",             "CP DUMP",    RK_OK,     "notify when a memory dump of the CP starts and ends"},
    {"UNSUBSCRIBE",           "CP DUMP",    RK_OK,     "stop notifying"},
};
// clang-format on

#endif  // CLIENT_REQUESTTABLE_H_
