#include "kestctl/Commands.h"

#include <strings.h>

#include <algorithm>

#include "config/CpType.h"
#include "kestctl/ControlConnection.h"
#include "kestctl/Reply.h"
#include "kestctl/handlers.h"

namespace {

const int TIMEOUT = 10;
// The service replies when the CP has delivered the data.
const int SAVE_TIMEOUT = 60;

// clang-format off
const ParamForm P_NONE = {"",                    0, 0, {PK_CP, PK_CP},     nullptr};
const ParamForm P_CP   = {"CP",                  1, 1, {PK_CP, PK_CP},     nullptr};
const ParamForm P_CPS  = {"CP...",               1, 5, {PK_CP, PK_CP},     nullptr};
const ParamForm P_ANY  = {"[CP...]",             0, CP_TYPE_NUM, {PK_CP, PK_CP}, nullptr};
const ParamForm P_IQ   = {"CP [WCDMA]",          1, 2, {PK_CP, PK_IQ},     "WCDMA"};
const ParamForm P_MB   = {"MB",                  1, 1, {PK_MB, PK_MB},     nullptr};
const ParamForm P_POS  = {"INTERNAL|EXTERNAL",   1, 1, {PK_POS, PK_POS},   nullptr};
const ParamForm P_LINE = {"'LINE'",              1, 1, {PK_LINE, PK_LINE}, nullptr};
// clang-format on

}  // namespace

// clang-format off
const Command COMMANDS[COMMAND_NUM] = {
    // name                  request                  params   reply      time-out
    {"status",                nullptr,                &P_NONE, RK_NONE,   TIMEOUT,      run_status,
     "show every setting and the log state of every CP"},
    {"watch",                 "SUBSCRIBE",            &P_ANY,  RK_NONE,   TIMEOUT,      run_watch,
     "tell when memory dumps start and end, of these CPs or all, until Ctrl-C"},
    {"enable-log",            "ENABLE_LOG",           &P_CPS,  RK_NONE,   TIMEOUT,      run_enable_log,
     "log these CPs, five at most, and say which are off all the same"},
    {"disable-log",           "DISABLE_LOG",          &P_CPS,  RK_NONE,   TIMEOUT,      run_request,
     "stop logging these CPs, five at most"},
    {"get-log-state",         "GET_LOG_STATE",        &P_CP,   RK_WORD,   TIMEOUT,      run_request,
     "is the CP logged: ON or OFF"},
    {"save-ringbuf",          "SAVE_RINGBUF",         &P_CP,   RK_NONE,   SAVE_TIMEOUT, run_request,
     "fetch the CP's ring buffer and save it"},
    {"save-sleep-log",        "SAVE_SLEEP_LOG",       &P_CP,   RK_NONE,   SAVE_TIMEOUT, run_request,
     "fetch the CP's sleep log and save it"},
    {"flush",                 "FLUSH",                &P_NONE, RK_NONE,   TIMEOUT,      run_request,
     "write out the log data that is still buffered"},
    {"reload",                "kestctl reload",       &P_NONE, RK_NONE,   TIMEOUT,      run_request,
     "switch the CPs' logs as the general logger's configuration says"},
    {"clear",                 "kestctl clear",        &P_NONE, RK_NONE,   TIMEOUT,      run_request,
     "delete all CP logs on all media"},
    {"get-log-file-size",     "GET_LOG_FILE_SIZE",    &P_NONE, RK_NUMBER, TIMEOUT,      run_request,
     "limit of one log file in MB"},
    {"set-log-file-size",     "SET_LOG_FILE_SIZE",    &P_MB,   RK_NONE,   TIMEOUT,      run_request,
     "set the limit of one log file"},
    {"get-data-max-size",     "GET_DATA_MAX_SIZE",    &P_NONE, RK_NUMBER, TIMEOUT,      run_request,
     "limit of the logs on the internal medium in MB"},
    {"set-data-max-size",     "SET_DATA_MAX_SIZE",    &P_MB,   RK_NONE,   TIMEOUT,      run_request,
     "set the limit of the logs on the internal medium"},
    {"get-sd-max-size",       "GET_SD_MAX_SIZE",      &P_NONE, RK_NUMBER, TIMEOUT,      run_request,
     "limit of the logs on the SD card in MB"},
    {"set-sd-max-size",       "SET_SD_MAX_SIZE",      &P_MB,   RK_NONE,   TIMEOUT,      run_request,
     "set the limit of the logs on the SD card"},
    {"get-log-overwrite",     "GET_LOG_OVERWRITE",    &P_NONE, RK_WORD,   TIMEOUT,      run_request,
     "do new logs replace the oldest at the limit: ENABLE or DISABLE"},
    {"enable-log-overwrite",  "ENABLE_LOG_OVERWRITE", &P_NONE, RK_NONE,   TIMEOUT,      run_request,
     "at the limit, delete the oldest logs"},
    {"disable-log-overwrite", "DISABLE_LOG_OVERWRITE", &P_NONE, RK_NONE,  TIMEOUT,      run_request,
     "at the limit, log no more"},
    {"get-md-stor-pos",       "GET_MD_STOR_POS",      &P_NONE, RK_WORD,   TIMEOUT,      run_request,
     "medium of mini dumps: INTERNAL, or EXTERNAL for the one in use"},
    {"set-md-stor-pos",       "SET_MD_STOR_POS",      &P_POS,  RK_NONE,   TIMEOUT,      run_request,
     "put mini dumps on the internal medium or the one in use"},
    {"enable-md",             "ENABLE_MD",            &P_NONE, RK_NONE,   TIMEOUT,      run_request,
     "save a mini dump when a CP crashes"},
    {"disable-md",            "DISABLE_MD",           &P_NONE, RK_NONE,   TIMEOUT,      run_request,
     "save no mini dumps"},
    {"mini-dump",             "MINI_DUMP",            &P_NONE, RK_NONE,   TIMEOUT,      run_request,
     "save a mini dump now, if the service can"},
    {"enable-iq",             "ENABLE_IQ",            &P_IQ,   RK_NONE,   TIMEOUT,      run_request,
     "capture the CP's I/Q samples"},
    {"disable-iq",            "DISABLE_IQ",           &P_IQ,   RK_NONE,   TIMEOUT,      run_request,
     "end the capture of the CP's I/Q samples"},
    {"raw",                   nullptr,                &P_LINE, RK_WORD,   TIMEOUT,      run_raw,
     "send the line as it is and print the line that answers it"},
};
// clang-format on

const Command* find_command(const std::string& name) {
    for (const Command& command : COMMANDS) {
        if (name == command.name) {
            return &command;
        }
    }
    return nullptr;
}

const Command* find_request(const std::string& line) {
    const size_t start = line.find_first_not_of(" \t\r");
    const std::string rest = start == std::string::npos ? "" : line.substr(start);
    for (const Command& command : COMMANDS) {
        if (command.request && rest.find(command.request) == 0) {
            const char after = rest.c_str()[std::string(command.request).size()];
            if (after == '\0' || after == ' ' || after == '\t' || after == '\r') {
                return &command;
            }
        }
    }
    return nullptr;
}

const char* param_word(ParamKind kind, size_t i) {
    static const char* const POSITIONS[] = {"INTERNAL", "EXTERNAL"};
    switch (kind) {
        case PK_CP:
            return i < CP_TYPE_NUM ? cp_type_to_request_name(static_cast<CpType>(i)) : nullptr;
        case PK_POS:
            return i < 2 ? POSITIONS[i] : nullptr;
        case PK_IQ:
            return i < 1 ? "WCDMA" : nullptr;
        default:
            return nullptr;
    }
}

namespace {

// Checks one parameter and gives it the spelling of the service.
bool check_arg(ParamKind kind, std::string* arg, std::string* reason) {
    if (kind == PK_MB) {
        *reason = "'" + *arg + "' is no number of megabytes";
        return is_number(*arg);
    }
    if (kind == PK_LINE) {
        *reason = "a request is one line of at most " +
                  std::to_string(ControlConnection::MAX_REQUEST) + " bytes and not blank";
        return arg->find('\n') == std::string::npos &&
               arg->size() <= ControlConnection::MAX_REQUEST &&
               arg->find_first_not_of(" \t\r") != std::string::npos;
    }
    *reason = "'" + *arg + "' is none of";
    for (size_t i = 0; const char* word = param_word(kind, i); ++i) {
        if (strcasecmp(word, arg->c_str()) == 0) {
            *arg = word;
            return true;
        }
        *reason += std::string(" ") + word;
    }
    return false;
}

}  // namespace

bool check_args(const Command& command, Args* args, std::string* reason) {
    const ParamForm& form = *command.params;
    if (args->size() < form.min || args->size() > form.max) {
        *reason = args->size() < form.min ? "parameter missing" : "too many parameters";
        return false;
    }
    for (size_t i = 0; i < args->size(); ++i) {
        std::string& arg = (*args)[i];
        const ParamKind kind = form.kinds[i > 0];
        if (!check_arg(kind, &arg, reason)) {
            return false;
        }
        const auto this_one = args->begin() + static_cast<Args::difference_type>(i);
        if (kind == form.kinds[0] && std::find(args->begin(), this_one, arg) != this_one) {
            *reason = "'" + arg + "' is given twice";
            return false;
        }
    }
    if (form.fill && args->size() < form.max) {
        args->push_back(form.fill);
    }
    return true;
}
