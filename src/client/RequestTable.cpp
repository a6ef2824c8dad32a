// SPDX-License-Identifier: Apache-2.0
// Which handler carries out which request.
#include "client/RequestTable.h"

#include <string_view>

#include "client/ClientHandler.h"
#include "core/text.h"

namespace {

// Whether each request has one handler and each handler a request.
template <typename Route, size_t N>
constexpr bool cover_all_requests(const Route (&routes)[N]) {
    bool used[N] = {};
    for (const ControlRequest& request : CONTROL_REQUESTS) {
        size_t found = 0;
        for (size_t i = 0; i < N; ++i) {
            if (request.keyword() == routes[i].keyword) {
                used[i] = true;
                ++found;
            }
        }
        if (found != 1) {
            return false;
        }
    }
    for (const bool each : used) {
        if (!each) {
            return false;
        }
    }
    return true;
}

}  // namespace

ClientHandler::RequestHandler ClientHandler::find_handler(const uint8_t* keyword, size_t len) {
    struct Route {
        const char* keyword;
        RequestHandler handler;
    };
    // clang-format off
    static constexpr Route ROUTES[] = {
        {"ENABLE_LOG",            &ClientHandler::proc_enable_log},
        {"DISABLE_LOG",           &ClientHandler::proc_disable_log},
        {"GET_LOG_STATE",         &ClientHandler::proc_get_log_state},
        {"SAVE_RINGBUF",          &ClientHandler::proc_ringbuf},
        {"SAVE_SLEEP_LOG",        &ClientHandler::proc_sleep_log},
        {"FLUSH",                 &ClientHandler::proc_flush},
        {"kestctl",               &ClientHandler::proc_kestctl},
        {"SET_LOG_FILE_SIZE",     &ClientHandler::proc_set_log_file_size},
        {"GET_LOG_FILE_SIZE",     &ClientHandler::proc_get_log_file_size},
        {"SET_DATA_MAX_SIZE",     &ClientHandler::proc_set_data_part_size},
        {"GET_DATA_MAX_SIZE",     &ClientHandler::proc_get_data_part_size},
        {"SET_SD_MAX_SIZE",       &ClientHandler::proc_set_sd_size},
        {"GET_SD_MAX_SIZE",       &ClientHandler::proc_get_sd_size},
        {"ENABLE_LOG_OVERWRITE",  &ClientHandler::proc_enable_overwrite},
        {"DISABLE_LOG_OVERWRITE", &ClientHandler::proc_disable_overwrite},
        {"GET_LOG_OVERWRITE",     &ClientHandler::proc_get_log_overwrite},
        {"SET_MD_STOR_POS",       &ClientHandler::proc_set_md_pos},
        {"GET_MD_STOR_POS",       &ClientHandler::proc_get_md_pos},
        {"ENABLE_MD",             &ClientHandler::proc_enable_md},
        {"DISABLE_MD",            &ClientHandler::proc_disable_md},
        {"MINI_DUMP",             &ClientHandler::proc_mini_dump},
        {"ENABLE_IQ",             &ClientHandler::proc_enable_iq},
        {"DISABLE_IQ",            &ClientHandler::proc_disable_iq},
        {"SUBSCRIBE",             &ClientHandler::proc_subscribe},
        {"UNSUBSCRIBE",           &ClientHandler::proc_unsubscribe},
    };
    // clang-format on
    static_assert(cover_all_requests(ROUTES), "a request of the table has no handler");
    for (const Route& route : ROUTES) {
        if (token_equals(keyword, len, route.keyword)) {
            return route.handler;
        }
    }
    return nullptr;
}
