// SPDX-License-Identifier: Apache-2.0

#include "control/LogController.h"

#include "channels/AgDspLogHandler.h"
#include "channels/ExtWcnLogHandler.h"
#include "channels/GnssCpLogHandler.h"
#include "channels/WanModemLogHandler.h"
#include "client/ClientManager.h"
#include "core/log.h"
#include "core/system_paths.h"
#include "state/ExtWcnStateHandler.h"
#include "state/ModemStateHandler.h"

namespace {

constexpr size_t MAX_CLIENTS = 3;

}  // namespace

LogController::LogController() {}

LogController::~LogController() {
    delete m_wcn_state;
    delete m_modem_state;
    for (LogPipeHandler* pipe : m_log_pipes) {
        delete pipe;
    }
}

int LogController::init(LogConfig* config) {
    m_stor_mgr.set_data_part_size(static_cast<uint64_t>(config->data_log_size())
                                  << MB_TO_BYTES_SHIFT);
    m_stor_mgr.set_sd_size(static_cast<uint64_t>(config->sd_log_size()) << MB_TO_BYTES_SHIFT);
    m_stor_mgr.set_file_size(config->log_file_size() << MB_TO_BYTES_SHIFT);
    m_stor_mgr.set_overwrite(config->log_overwrite());
    if (config->kest_dir()) {
        info_log("modem log will be placed in kest dir!");
        m_stor_mgr.set_kest_layout(true);
    }
    if (m_stor_mgr.init(config->sd_root(), this, &m_multiplexer) < 0) {
        err_log("init storage manager error");
        return -1;
    }
    m_config = config;
    m_save_md = config->save_md();
    for (const LogConfig::ConfigEntry* entry : config->stream_entries()) {
        m_log_pipes.push_back(create_handler(entry));
    }
    m_cli_mgr = std::make_unique<ClientManager>(this, &m_multiplexer, MAX_CLIENTS);
    if (m_cli_mgr->init(SOCKET_CONTROL) < 0) {
        m_cli_mgr.reset();
    }
    init_state_handler(m_modem_state, SOCKET_MODEM_SUPERVISOR);
    init_wcn_state_handler(m_wcn_state, SOCKET_WCN_SUPERVISOR);
    return 0;
}

void LogController::run() {
    m_multiplexer.run();
}

void LogController::init_state_handler(ModemStateHandler*& handler, const char* name) {
    auto state = std::make_unique<ModemStateHandler>(this, &m_multiplexer, name);
    if (state->init() < 0) {
        err_log("kestcp: connect to %s error", name);
        return;
    }
    handler = state.release();
}

void LogController::init_wcn_state_handler(ExtWcnStateHandler*& handler, const char* name) {
    auto state = std::make_unique<ExtWcnStateHandler>(this, &m_multiplexer, name);
    if (state->init() < 0) {
        err_log("connect to %s error", name);
        return;
    }
    handler = state.release();
}

LogPipeHandler* LogController::create_handler(const LogConfig::ConfigEntry* entry) {
    LogPipeHandler* handler;
    switch (entry->type) {
        case CT_WCN:
            handler = new ExtWcnLogHandler(this, &m_multiplexer, entry, &m_stor_mgr);
            break;
        case CT_GNSS:
            handler = new GnssCpLogHandler(this, &m_multiplexer, entry, &m_stor_mgr);
            break;
        case CT_AGDSP:
            handler = new AgDspLogHandler(this, &m_multiplexer, entry, &m_stor_mgr);
            break;
        default:
            handler = new WanModemLogHandler(this, &m_multiplexer, entry, &m_stor_mgr,
                                             cp_mem_path(entry->type));
            break;
    }
    if (m_config->wcdma_iq_enabled(entry->type)) {
        handler->enable_wcdma_iq();
    }
    if (!entry->enable) {
        return handler;
    }
    const char* name = entry->name.string();
    bool same;
    android::String8 log_path;
    android::String8 diag_path;
    if (m_config->get_dev_paths(entry->type, same, log_path, diag_path) < 0) {
        err_log("Can not get log/diag path for %s", name);
        return handler;
    }
    if (same) {
        info_log("CP %s dev %s", name, log_path.string());
        handler->set_log_diag_dev_path(log_path);
    } else {
        info_log("CP %s dev %s %s", name, log_path.string(), diag_path.string());
        handler->set_dev_paths(log_path, diag_path);
    }
    if (handler->start() < 0) {
        err_log("kestcp: start %s log failed", name);
    }
    return handler;
}

LogPipeHandler* LogController::get_cp(CpType type) const {
    for (LogPipeHandler* pipe : m_log_pipes) {
        if (pipe->type() == type) {
            return pipe;
        }
    }
    return nullptr;
}

void LogController::notify_cp_dump(CpType type, CpDumpEvent event) {
    if (m_cli_mgr) {
        m_cli_mgr->notify_cp_dump(type, event);
    }
}

void LogController::process_cp_evt(CpType type, CpStateHandler::CpEvent event) {
    const CpType cp = type == CT_WANMODEM ? LogConfig::wan_modem_type() : type;
    LogPipeHandler* channel = get_cp(cp);
    if (!channel) {
        err_log("kestcp: unknown MODEM type %d asserts", type);
        return;
    }
    switch (event) {
        case CpStateHandler::CE_ALIVE:
            channel->process_alive();
            break;
        case CpStateHandler::CE_ASSERT:
        case CpStateHandler::CE_BLOCKED:
            channel->process_assert(m_save_md);
            break;
        default:
            err_log("unknown event %d", event);
            break;
    }
}
