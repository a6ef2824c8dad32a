// SPDX-License-Identifier: Apache-2.0
// The control operations of LogController: what the requests of the clients do.
#include <stddef.h>

#include "channels/LogPipeHandler.h"
#include "config/KestConfig.h"
#include "control/LogController.h"
#include "core/log.h"
#include "core/system_paths.h"

int LogController::set_channel_devs(LogPipeHandler* channel) {
    bool same;
    android::String8 log_path;
    android::String8 diag_path;
    if (m_config->get_dev_paths(channel->type(), same, log_path, diag_path) < 0) {
        return -1;
    }
    if (same) {
        channel->set_log_diag_dev_path(log_path);
    } else {
        channel->set_dev_paths(log_path, diag_path);
    }
    return 0;
}

int LogController::enable_log(const CpType* types, size_t num) {
    size_t changed = 0;
    for (size_t i = 0; i < num; ++i) {
        LogPipeHandler* channel = get_cp(types[i]);
        if (!channel || channel->enabled()) {
            continue;
        }
        ++changed;
        if (set_channel_devs(channel) < 0) {
            err_log("Can not get log/diag path for %s", channel->name().string());
            continue;
        }
        channel->start();
        m_config->set_stream(types[i], true);
    }
    if (changed > 0 && m_config->save() < 0) {
        err_log("save config file failed");
    }
    return 0;
}

int LogController::disable_log(const CpType* types, size_t num) {
    size_t changed = 0;
    for (size_t i = 0; i < num; ++i) {
        LogPipeHandler* channel = get_cp(types[i]);
        if (channel && channel->enabled()) {
            ++changed;
            channel->stop();
            m_config->set_stream(types[i], false);
        }
    }
    if (changed > 0 && m_config->save() < 0) {
        err_log("save config file failed");
    }
    return 0;
}

bool LogController::get_log_state(CpType type) const {
    const LogPipeHandler* channel = get_cp(type);
    return channel && channel->enabled();
}

int LogController::enable_md() {
    if (m_save_md) {
        return 0;
    }
    m_save_md = true;
    m_config->set_md(true);
    if (m_config->save_changes() < 0) {
        err_log("save config file failed");
    }
    return 0;
}

int LogController::disable_md() {
    if (!m_save_md) {
        return 0;
    }
    m_save_md = false;
    m_config->set_md(false);
    if (m_config->save_changes() < 0) {
        err_log("save config file failed");
    }
    return 0;
}

int LogController::set_md_int_stor(bool internal) {
    m_config->set_md_int_stor(internal);
    if (m_config->save_changes() < 0) {
        err_log("save config file failed");
    }
    return 0;
}

bool LogController::get_md_int_stor() const {
    return m_config->md_int_stor();
}

int LogController::save_mini_dump_on_request() {
    return -1;
}

int LogController::set_log_file_size(size_t mb) {
    const uint32_t size = static_cast<uint32_t>(mb);
    m_stor_mgr.set_file_size(size << MB_TO_BYTES_SHIFT);
    m_config->set_log_file_size(size);
    if (m_config->save_changes() < 0) {
        err_log("save config file failed");
    }
    return 0;
}

size_t LogController::get_log_file_size() const {
    return m_config->log_file_size();
}

int LogController::set_data_part_size(size_t mb) {
    m_stor_mgr.set_data_part_size(static_cast<uint64_t>(mb) << MB_TO_BYTES_SHIFT);
    m_config->set_data_log_size(static_cast<uint32_t>(mb));
    if (m_config->save_changes() < 0) {
        err_log("save config file failed");
    }
    return 0;
}

size_t LogController::get_data_part_size() const {
    return m_config->data_log_size();
}

int LogController::set_sd_size(size_t mb) {
    m_stor_mgr.set_sd_size(static_cast<uint64_t>(mb) << MB_TO_BYTES_SHIFT);
    m_config->set_sd_log_size(static_cast<uint32_t>(mb));
    if (m_config->save_changes() < 0) {
        err_log("save config file failed");
    }
    return 0;
}

size_t LogController::get_sd_size() const {
    return m_config->sd_log_size();
}

int LogController::set_log_overwrite(bool enable) {
    m_stor_mgr.set_overwrite(enable);
    m_config->set_log_overwrite(enable);
    if (m_config->save_changes() < 0) {
        err_log("save config file failed");
    }
    return 0;
}

bool LogController::get_log_overwrite() const {
    return m_config->log_overwrite();
}

int LogController::enable_wcdma_iq(CpType type) {
    info_log("enable WCDMA I/Q on CP %d", type);
    LogPipeHandler* channel = get_cp(type);
    if (!channel) {
        return CR_NO_CHANNEL;
    }
    const int result = channel->enable_wcdma_iq();
    if (result != 0) {
        return result;
    }
    m_config->enable_iq(type, LogConfig::IQ_WCDMA);
    m_config->save();
    return 0;
}

int LogController::disable_wcdma_iq(CpType type) {
    LogPipeHandler* channel = get_cp(type);
    if (!channel) {
        return CR_NO_CHANNEL;
    }
    const int result = channel->disable_wcdma_iq();
    if (result != 0) {
        return result;
    }
    m_config->disable_iq(type, LogConfig::IQ_WCDMA);
    m_config->save();
    return 0;
}

int LogController::flush() {
    for (LogPipeHandler* channel : m_log_pipes) {
        if (channel->enabled()) {
            channel->flush();
        }
    }
    return 0;
}

int LogController::clear_log() {
    for (const LogPipeHandler* channel : m_log_pipes) {
        const CpWorkState state = channel->state();
        if (state == CWS_DUMP || state == CWS_SAVE_SLEEP_LOG || state == CWS_SAVE_RINGBUF) {
            return CR_BUSY;
        }
    }
    for (LogPipeHandler* channel : m_log_pipes) {
        if (channel->enabled()) {
            channel->pause_wcdma_iq();
        }
    }
    m_stor_mgr.clear_all();
    for (LogPipeHandler* channel : m_log_pipes) {
        if (channel->enabled()) {
            channel->resume_wcdma_iq();
        }
    }
    return 0;
}

int LogController::reload_kest_conf() {
    KestConfig foreign;
    if (foreign.read_config(system_path(PATH_FOREIGN_CONFIG_FILE).string()) < 0) {
        err_log("load kest.conf failed");
        return -1;
    }
    for (const KestConfig::StreamEntry* entry : foreign.stream_entries()) {
        LogPipeHandler* channel = get_cp(entry->type);
        if (!channel || channel->enabled() == entry->enable) {
            continue;
        }
        info_log("%s CP %s", entry->enable ? "enable" : "disable", channel->name().string());
        if (!entry->enable) {
            channel->flush();
            channel->stop();
        } else if (set_channel_devs(channel) < 0) {
            err_log("Can not get log/diag path for %s", channel->name().string());
        } else {
            channel->start();
        }
        m_config->set_stream(entry->type, entry->enable);
    }
    if (m_config->save_changes() < 0) {
        err_log("save config failed");
    }
    return 0;
}
