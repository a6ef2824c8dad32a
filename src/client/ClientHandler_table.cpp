// The requests of the control socket, one row each: what is sent, who handles it, what
// it takes and what it does.
#include "client/ClientHandler.h"
#include "core/text.h"

// clang-format off
const ClientHandler::Request ClientHandler::REQUESTS[REQUEST_NUM] = {
    // keyword              handler                                  parameters        what it does
    {"ENABLE_LOG",           &ClientHandler::proc_enable_log,         "CP...",          "log these CPs (1 to 5)"},
    {"DISABLE_LOG",          &ClientHandler::proc_disable_log,        "CP...",          "stop logging these CPs (1 to 5)"},
    {"GET_LOG_STATE",        &ClientHandler::proc_get_log_state,      "CP",             "is the CP logged: ON or OFF"},
    {"FLUSH",                &ClientHandler::proc_flush,              "",               "write out buffered log data"},
    {"kestctl",              &ClientHandler::proc_kestctl,            "reload|clear",   "follow the general logger's settings; delete all logs"},
    {"SET_LOG_FILE_SIZE",    &ClientHandler::proc_set_log_file_size,  "MB",             "limit of one log file"},
    {"GET_LOG_FILE_SIZE",    &ClientHandler::proc_get_log_file_size,  "",               "the same, asked"},
    {"SET_DATA_MAX_SIZE",    &ClientHandler::proc_set_data_part_size, "MB",             "limit of the logs on the internal medium"},
    {"GET_DATA_MAX_SIZE",    &ClientHandler::proc_get_data_part_size, "",               "the same, asked"},
    {"SET_SD_MAX_SIZE",      &ClientHandler::proc_set_sd_size,        "MB",             "limit of the logs on the SD card"},
    {"GET_SD_MAX_SIZE",      &ClientHandler::proc_get_sd_size,        "",               "the same, asked"},
    {"ENABLE_LOG_OVERWRITE", &ClientHandler::proc_enable_overwrite,   "",               "at the limit, delete the oldest logs"},
    {"DISABLE_LOG_OVERWRITE",&ClientHandler::proc_disable_overwrite,  "",               "at the limit, log no more"},
    {"GET_LOG_OVERWRITE",    &ClientHandler::proc_get_log_overwrite,  "",               "which of the two: ENABLE or DISABLE"},
    {"ENABLE_MD",            &ClientHandler::proc_enable_md,          "",               "save a mini dump when a CP crashes"},
    {"DISABLE_MD",           &ClientHandler::proc_disable_md,         "",               "save none"},
    {"MINI_DUMP",            &ClientHandler::proc_mini_dump,          "",               "save one now (not supported)"},
    {"SET_MD_STOR_POS",      &ClientHandler::proc_set_md_pos,         "INTERNAL|other", "medium of mini dumps: internal, or the one in use"},
    {"GET_MD_STOR_POS",      &ClientHandler::proc_get_md_pos,         "",               "the same, asked: INTERNAL or EXTERNAL"},
    {"ENABLE_IQ",            &ClientHandler::proc_enable_iq,          "CP WCDMA",       "capture the modem's I/Q samples"},
    {"DISABLE_IQ",           &ClientHandler::proc_disable_iq,         "CP [WCDMA]",     "end the capture"},
    {"SAVE_SLEEP_LOG",       &ClientHandler::proc_sleep_log,          "CP",             "fetch the CP's sleep log; answered when it is saved"},
    {"SAVE_RINGBUF",         &ClientHandler::proc_ringbuf,            "CP",             "fetch the CP's ring buffer; answered when it is saved"},
    {"SUBSCRIBE",            &ClientHandler::proc_subscribe,          "CP DUMP",        "tell when a memory dump of the CP starts and ends"},
    {"UNSUBSCRIBE",          &ClientHandler::proc_unsubscribe,        "CP DUMP",        "tell no more"},
};
// clang-format on

const ClientHandler::Request* ClientHandler::find_request(const uint8_t* keyword, size_t len) {
    for (const Request& request : REQUESTS) {
        if (token_equals(keyword, len, request.keyword)) {
            return &request;
        }
    }
    return nullptr;
}
