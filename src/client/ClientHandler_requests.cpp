// SPDX-License-Identifier: Apache-2.0
// What each request does. Every handler checks its parameters, logs, calls the
// controller and replies, and does nothing else.
#include "channels/LogPipeHandler.h"
#include "client/ClientHandler.h"
#include "client/RequestParams.h"
#include "control/LogController.h"
#include "core/log.h"

namespace {

// The parameters of ENABLE_IQ and DISABLE_IQ: what is wrong with them, or null.
const char* parse_iq(RequestParams params, bool type_needed, CpType& cp) {
    const ParamError error = params.take_cp(cp);
    if (error) {
        return error == PE_MISSING ? "no param" : "invalid CP type";
    }
    bool is_wcdma;
    if (params.take_word("WCDMA", is_wcdma) == PE_MISSING) {
        return type_needed ? "no I/Q type" : nullptr;
    }
    return is_wcdma ? nullptr : "unknown I/Q type";
}

// The parameters of SUBSCRIBE and UNSUBSCRIBE, likewise.
const char* parse_subscription(RequestParams params, CpType& cp) {
    const ParamError error = params.take_cp(cp);
    if (error) {
        return error == PE_MISSING ? "no param" : "invalid CP type";
    }
    bool is_dump;
    if (params.take_word("DUMP", is_dump) == PE_MISSING) {
        return "no <event>";
    }
    if (!is_dump) {
        return "invalid <event>";
    }
    return params.take_end() ? "more params than expected" : nullptr;
}

// The parameters of SAVE_SLEEP_LOG and SAVE_RINGBUF, likewise; finds the CP's channel.
const char* parse_save(RequestParams params, LogController* ctrl, LogPipeHandler*& channel) {
    CpType cp;
    const ParamError error = params.take_cp(cp);
    if (error) {
        return error == PE_MISSING ? "no param" : "invalid CP type";
    }
    if (params.take_end()) {
        return "extra parameter";
    }
    channel = ctrl->get_cp(cp);
    return channel ? nullptr : "unknown CP";
}

// One size and nothing more. mb is filled in also when more follows (PE_EXTRA).
ParamError parse_size(RequestParams params, uint32_t& mb) {
    const ParamError error = params.take_size(mb);
    return error ? error : params.take_end();
}

bool has_token(const uint8_t* params, size_t len) {
    return RequestParams(params, len).take_end() != PE_NONE;
}

const char* medium_word(bool internal) {
    return internal ? "INTERNAL" : "EXTERNAL";
}

}  // namespace

// Logging of CPs.

void ClientHandler::proc_enable_log(const uint8_t* params, size_t len) {
    info_log("ENABLE_LOG %.*s", static_cast<int>(len), reinterpret_cast<const char*>(params));
    CpType types[RequestParams::MAX_CPS];
    size_t num;
    if (RequestParams(params, len).take_cp_list(types, num)) {
        return reply(RC_BAD_PARAM);
    }
    reply(m_log_ctrl->enable_log(types, num) ? RC_FAILED : RC_OK);
}

void ClientHandler::proc_disable_log(const uint8_t* params, size_t len) {
    info_log("DISABLE_LOG %.*s", static_cast<int>(len), reinterpret_cast<const char*>(params));
    CpType types[RequestParams::MAX_CPS];
    size_t num;
    if (RequestParams(params, len).take_cp_list(types, num)) {
        return reply(RC_BAD_PARAM);
    }
    reply(m_log_ctrl->disable_log(types, num) ? RC_FAILED : RC_OK);
}

void ClientHandler::proc_get_log_state(const uint8_t* params, size_t len) {
    CpType cp;
    const ParamError error = RequestParams(params, len).take_cp(cp);
    if (error == PE_MISSING) {
        err_log("GET_LOG_STATE no param");
        return reply(RC_BAD_PARAM);
    }
    if (error) {
        err_log("GET_LOG_STATE invalid CP type");
        return reply(RC_UNKNOWN_CP);
    }
    reply_word(m_log_ctrl->get_log_state(cp) ? "ON" : "OFF");
}

void ClientHandler::proc_flush(const uint8_t* params, size_t len) {
    if (has_token(params, len)) {
        return reply(RC_UNKNOWN_REQUEST);
    }
    reply(m_log_ctrl->flush() ? RC_FAILED : RC_OK);
}

void ClientHandler::proc_kestctl(const uint8_t* params, size_t len) {
    bool reload = false;
    bool clear = false;
    RequestParams(params, len).take_word("reload", reload);
    RequestParams(params, len).take_word("clear", clear);
    if (reload) {
        info_log("reload kest.conf");
        reply(m_log_ctrl->reload_kest_conf() ? RC_FAILED : RC_OK);
    } else if (clear) {
        info_log("remove CP log");
        const int result = m_log_ctrl->clear_log();
        reply(result == CR_BUSY ? RC_BUSY : result ? RC_FAILED : RC_OK);
    } else {
        reply(RC_UNKNOWN_REQUEST);
    }
}

// Limits.

void ClientHandler::proc_set_log_file_size(const uint8_t* params, size_t len) {
    uint32_t mb;
    const ParamError error = parse_size(RequestParams(params, len), mb);
    if (error == PE_MISSING || error == PE_INVALID) {
        err_log("SET_LOG_FILE_SIZE %s", error == PE_MISSING ? "invalid parameter" : "invalid size");
        return reply(RC_BAD_PARAM);
    }
    info_log("SET_LOG_FILE_SIZE %u", mb);
    if (error) {
        return reply(RC_BAD_PARAM);
    }
    m_log_ctrl->set_log_file_size(mb);
    reply(RC_OK);
}

void ClientHandler::proc_get_log_file_size(const uint8_t* params, size_t len) {
    if (has_token(params, len)) {
        err_log("GET_LOG_FILE_SIZE invalid param");
        return reply(RC_BAD_PARAM);
    }
    const unsigned int mb = static_cast<unsigned int>(m_log_ctrl->get_log_file_size());
    reply_number(mb);
    info_log("GET_LOG_FILE_SIZE %u", mb);
}

void ClientHandler::proc_set_data_part_size(const uint8_t* params, size_t len) {
    uint32_t mb;
    const ParamError error = parse_size(RequestParams(params, len), mb);
    if (error) {
        err_log("SET_DATA_MAX_SIZE %s", error == PE_MISSING ? "no param" : "invalid param");
        return reply(RC_BAD_PARAM);
    }
    info_log("SET_DATA_MAX_SIZE %u", mb);
    m_log_ctrl->set_data_part_size(mb);
    reply(RC_OK);
}

void ClientHandler::proc_get_data_part_size(const uint8_t* params, size_t len) {
    if (has_token(params, len)) {
        err_log("GET_DATA_MAX_SIZE invalid param");
        return reply(RC_BAD_PARAM);
    }
    const unsigned int mb = static_cast<unsigned int>(m_log_ctrl->get_data_part_size());
    reply_number(mb);
    info_log("GET_DATA_MAX_SIZE %u", mb);
}

void ClientHandler::proc_set_sd_size(const uint8_t* params, size_t len) {
    uint32_t mb;
    const ParamError error = parse_size(RequestParams(params, len), mb);
    if (error) {
        err_log("SET_SD_MAX_SIZE %s", error == PE_MISSING   ? "no param"
                                      : error == PE_INVALID ? "invalid size"
                                                            : "invalid param");
        return reply(RC_BAD_PARAM);
    }
    info_log("SET_SD_MAX_SIZE %u", mb);
    m_log_ctrl->set_sd_size(mb);
    reply(RC_OK);
}

void ClientHandler::proc_get_sd_size(const uint8_t* params, size_t len) {
    if (has_token(params, len)) {
        err_log("GET_SD_MAX_SIZE invalid param");
        return reply(RC_BAD_PARAM);
    }
    const unsigned int mb = static_cast<unsigned int>(m_log_ctrl->get_sd_size());
    reply_number(mb);
    info_log("GET_SD_MAX_SIZE %u", mb);
}

void ClientHandler::proc_enable_overwrite(const uint8_t* params, size_t len) {
    if (has_token(params, len)) {
        err_log("ENABLE_LOG_OVERWRITE invalid param");
        return reply(RC_BAD_PARAM);
    }
    info_log("ENABLE_LOG_OVERWRITE");
    m_log_ctrl->set_log_overwrite(true);
    reply(RC_OK);
}

void ClientHandler::proc_disable_overwrite(const uint8_t* params, size_t len) {
    if (has_token(params, len)) {
        err_log("DISABLE_LOG_OVERWRITE invalid param");
        return reply(RC_BAD_PARAM);
    }
    info_log("DISABLE_LOG_OVERWRITE");
    m_log_ctrl->set_log_overwrite(false);
    reply(RC_OK);
}

void ClientHandler::proc_get_log_overwrite(const uint8_t* params, size_t len) {
    if (has_token(params, len)) {
        err_log("GET_LOG_OVERWRITE invalid param");
        return reply(RC_BAD_PARAM);
    }
    const char* word = m_log_ctrl->get_log_overwrite() ? "ENABLE" : "DISABLE";
    reply_word(word);
    info_log("GET_LOG_OVERWRITE %s", word);
}

// Mini dumps.

void ClientHandler::proc_enable_md(const uint8_t* params, size_t len) {
    if (!RequestParams(params, len).is_blank()) {
        return reply(RC_BAD_PARAM);
    }
    reply(m_log_ctrl->enable_md() ? RC_FAILED : RC_OK);
}

void ClientHandler::proc_disable_md(const uint8_t* params, size_t len) {
    if (!RequestParams(params, len).is_blank()) {
        return reply(RC_BAD_PARAM);
    }
    reply(m_log_ctrl->disable_md() ? RC_FAILED : RC_OK);
}

void ClientHandler::proc_mini_dump(const uint8_t* params, size_t len) {
    if (!RequestParams(params, len).is_blank()) {
        return reply(RC_BAD_PARAM);
    }
    reply(m_log_ctrl->save_mini_dump_on_request() ? RC_FAILED : RC_OK);
}

void ClientHandler::proc_set_md_pos(const uint8_t* params, size_t len) {
    bool internal;
    if (RequestParams(params, len).take_word("INTERNAL", internal)) {
        err_log("SET_MD_STOR_POS invalid param");
        return reply(RC_BAD_PARAM);
    }
    info_log("SET_MD_STOR_POS: %s.", medium_word(internal));
    m_log_ctrl->set_md_int_stor(internal);
    reply(RC_OK);
}

void ClientHandler::proc_get_md_pos(const uint8_t* params, size_t len) {
    if (has_token(params, len)) {
        err_log("GET_MD_STOR_POS invalid param");
        return reply(RC_BAD_PARAM);
    }
    const char* word = medium_word(m_log_ctrl->get_md_int_stor());
    reply_word(word);
    info_log("GET_MD_STOR_POS %s.", word);
}

// I/Q captures.

void ClientHandler::proc_enable_iq(const uint8_t* params, size_t len) {
    CpType cp;
    const char* wrong = parse_iq(RequestParams(params, len), true, cp);
    if (wrong) {
        err_log("ENABLE_IQ %s", wrong);
        return reply(RC_BAD_PARAM);
    }
    const int result = m_log_ctrl->enable_wcdma_iq(cp);
    if (result) {
        err_log("enable_iq error %d", result);
    }
    reply(result_to_error(result));
}

void ClientHandler::proc_disable_iq(const uint8_t* params, size_t len) {
    CpType cp;
    const char* wrong = parse_iq(RequestParams(params, len), false, cp);
    if (wrong) {
        err_log("DISABLE_IQ %s", wrong);
        return reply(RC_BAD_PARAM);
    }
    const int result = m_log_ctrl->disable_wcdma_iq(cp);
    if (result) {
        err_log("disable_iq error %d", result);
    }
    reply(result_to_error(result));
}

// Dump subscriptions.

void ClientHandler::proc_subscribe(const uint8_t* params, size_t len) {
    CpType cp;
    const char* wrong = parse_subscription(RequestParams(params, len), cp);
    if (wrong) {
        err_log("SUBSCRIBE %s", wrong);
        return reply(RC_BAD_PARAM);
    }
    m_dump_subscribed[cp] = true;
    reply(RC_OK);
}

void ClientHandler::proc_unsubscribe(const uint8_t* params, size_t len) {
    CpType cp;
    const char* wrong = parse_subscription(RequestParams(params, len), cp);
    if (wrong) {
        err_log("UNSUBSCRIBE %s", wrong);
        return reply(RC_BAD_PARAM);
    }
    m_dump_subscribed[cp] = false;
    reply(RC_OK);
}

// Transactions, answered when they end.

void ClientHandler::proc_sleep_log(const uint8_t* params, size_t len) {
    info_log("SAVE_SLEEP_LOG");
    LogPipeHandler* channel;
    const char* wrong = parse_save(RequestParams(params, len), m_log_ctrl, channel);
    if (wrong) {
        err_log("SAVE_SLEEP_LOG %s", wrong);
        return reply(RC_BAD_PARAM);
    }
    const int result = start_trans(CTT_SLEEP_LOG, channel);
    if (result != CR_STARTED) {
        err_log("Save sleep log error %d", result);
        reply(result_to_error(result));
    }
}

void ClientHandler::proc_ringbuf(const uint8_t* params, size_t len) {
    info_log("SAVE_RINGBUF");
    LogPipeHandler* channel;
    const char* wrong = parse_save(RequestParams(params, len), m_log_ctrl, channel);
    if (wrong) {
        err_log("SAVE_RINGBUF %s", wrong);
        return reply(RC_BAD_PARAM);
    }
    const int result = start_trans(CTT_RINGBUF, channel);
    if (result != CR_STARTED) {
        err_log("Save ringbuf error %d", result);
        reply(result_to_error(result));
    }
}

void ClientHandler::proc_sleep_log_result(int result) {
    info_log("SAVE_SLEEP_LOG result %d", result);
    end_trans(result);
}

void ClientHandler::proc_ringbuf_result(int result) {
    info_log("SAVE_RINGBUF result %d", result);
    end_trans(result);
}
