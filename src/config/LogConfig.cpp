// SPDX-License-Identifier: Apache-2.0

#include "config/LogConfig.h"

#include <cutils/properties.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include "config/ConfigReader.h"
#include "config/config_text.h"
#include "config/property_names.h"
#include "config/settings_file.h"
#include "core/log.h"
#include "core/system_paths.h"

using android::String8;

CpType LogConfig::s_wan_modem_type = CT_UNKNOWN;

LogConfig::LogConfig(const char* config_file)
    : m_dirty(false),
      m_config_file(config_file),
      m_md(false),
      m_md_int_stor(false),
      m_kest_dir(false),
      m_log_file_size(5),
      m_data_log_size(25),
      m_sd_log_size(250),
      m_log_overwrite(true) {}

LogConfig::~LogConfig() {
    for (IqEntry* entry : m_iqs) {
        delete entry;
    }
    for (ConfigEntry* entry : m_streams) {
        delete entry;
    }
}

int LogConfig::read_config(int argc, char** argv) {
    opterr = 0;
    optind = 0;  // forget the state of any earlier scan
    for (int option; (option = getopt(argc, argv, "s")) != -1;) {
        if (option != 's') {
            err_log("parameters passed to kestmodem are unrecognised!");
            return -1;
        }
        info_log("option:-s Modem log will be saved in kest directory!");
        m_kest_dir = true;
    }

    get_sd_root();

    ConfigReader reader;
    if (open_settings(reader) < 0) {
        err_log("can not open %s", m_config_file.string());
        return -1;
    }
    while (const char* line = reader.next_line()) {
        if (parse_line(line) < 0) {
            err_log("invalid line: %d\n", reader.line_number());
        }
    }
    if (reader.failed()) {
        // With half of the settings the next change would write the file without the rest.
        err_log("can not open %s", m_config_file.string());
        return -1;
    }
    report_zero_limits();
    propget_wan_modem_type();
    return 0;
}

// Opens the settings file, put in place from the system default if need be.
int LogConfig::open_settings(ConfigReader& reader) const {
    const char* const file = m_config_file.string();
    const String8 default_file = system_path(PATH_DEFAULT_CONFIG_FILE);
    if (!is_unfinished_copy(file, default_file.string()) && reader.open(file) == 0) {
        return 0;
    }
    copy_default_settings(default_file.string(), file);
    return reader.open(file);
}

// A 0 is rarely meant: it is also what a missing or misspelt number gives.
void LogConfig::report_zero_limits() const {
    if (m_log_file_size << 20 == 0) {  // kept in 32 bits
        info_log("log_file_size %u: every write starts a new log file", m_log_file_size);
    }
    if (m_data_log_size == 0) {
        info_log("data_log_size 0: the internal medium has no quota");
    }
    if (m_sd_log_size == 0) {
        info_log("sd_log_size 0: the SD card has no quota");
    }
}

int LogConfig::parse_line(const char* line) {
    ConfigToken keyword;
    if (!next_token(line, keyword) || keyword.text[0] == '#') {
        return 0;
    }
    const char* rest = keyword.end();
    if (keyword.is("stream")) {
        return parse_stream_line(rest);
    }
    if (keyword.is("iq")) {
        return parse_iq_line(rest);
    }
    if (keyword.is("minidump")) {
        return parse_minidump_line(rest);
    }
    if (keyword.is("log_file_size")) {
        return parse_uint(rest, m_log_file_size);
    }
    if (keyword.is("data_log_size")) {
        return parse_uint(rest, m_data_log_size);
    }
    if (keyword.is("sd_log_size")) {
        return parse_uint(rest, m_sd_log_size);
    }
    ConfigToken state;
    if (!keyword.is("log_overwrite") || !next_token(rest, state)) {
        return -1;
    }
    m_log_overwrite = state.is("enable");
    return 0;
}

int LogConfig::parse_stream_line(const char* rest) {
    ConfigToken name;
    if (!next_token(rest, name)) {
        return -1;
    }
    const CpType type = cp_type_from_name(name.text, name.len);
    if (type == CT_UNKNOWN) {
        return 0;
    }
    bool enable;
    uint32_t size;
    uint32_t level;
    if (parse_stream_settings(name.end(), enable, size, level) < 0) {
        return -1;
    }
    const ConfigEntry settings{String8(name.text, name.len), type, enable, size, level};
    ConfigEntry* entry = stream_entry(type);
    if (entry) {
        *entry = settings;
        err_log("kestcp: duplicate CP %s in config file", entry->name.string());
    } else {
        m_streams.push_back(new ConfigEntry(settings));
    }
    return 0;
}

int LogConfig::parse_iq_line(const char* rest) {
    ConfigToken token;
    if (!next_token(rest, token)) {
        return -1;
    }
    IqEntry entry{cp_type_from_name(token.text, token.len), false, false};
    if (entry.type == CT_UNKNOWN) {
        err_log("invalid I/Q CP type");
        return 0;
    }
    while (next_token(token.end(), token)) {
        switch (iq_type_from_name(token.text, token.len)) {
            case IQ_GSM:
                entry.gsm = true;
                break;
            case IQ_WCDMA:
                entry.wcdma = true;
                break;
            default:
                err_log("invalid I/Q type");
                return 0;
        }
    }
    if (!entry.gsm && !entry.wcdma) {
        err_log("no I/Q type");
        return 0;
    }
    m_iqs.push_back(new IqEntry(entry));
    return 0;
}

int LogConfig::parse_minidump_line(const char* rest) {
    ConfigToken token;
    if (!next_token(rest, token)) {
        return -1;
    }
    m_md = token.is("enable");
    if (!next_token(token.end(), token)) {
        return -1;
    }
    m_md_int_stor = token.is("internal");
    return 0;
}

int LogConfig::iq_type_from_name(const void* text, size_t len) {
    const ConfigToken token{static_cast<const char*>(text), len};
    if (token.is("GSM")) {
        return IQ_GSM;
    }
    return token.is("WCDMA") ? IQ_WCDMA : -1;
}

int LogConfig::save() {
    // What cannot be written now is pending, also for a caller that changed nothing: the file
    // may have suffered.
    m_dirty = true;
    if (put_settings(m_config_file.string(), file_text()) < 0) {
        return -1;
    }
    m_dirty = false;
    return 0;
}

int LogConfig::save_changes() {
    return m_dirty ? save() : 0;
}

String8 LogConfig::file_text() const {
    String8 text;
    text.appendFormat("minidump %s\t%s\n", m_md ? "enable" : "disable",
                      m_md_int_stor ? "internal" : "external");
    text.appendFormat("log_file_size %u\n", m_log_file_size);
    text.appendFormat("data_log_size %u\n", m_data_log_size);
    text.appendFormat("sd_log_size %u\n", m_sd_log_size);
    text.appendFormat("log_overwrite %s\n\n", m_log_overwrite ? "enable" : "disable");
    for (const IqEntry* entry : m_iqs) {
        text.appendFormat("iq %s %s%s\n", cp_type_to_name(entry->type), entry->gsm ? "GSM " : "",
                          entry->wcdma ? "WCDMA" : "");
    }
    text.append("\n#Type\tName\tState\tSize\tLevel\n");
    for (const ConfigEntry* entry : m_streams) {
        text.appendFormat("stream\t%s\t%s\t%u\t%u\n", entry->name.string(),
                          entry->enable ? "on" : "off", entry->size, entry->level);
    }
    return text;
}

template <typename T>
void LogConfig::change(T& setting, T value) {
    if (setting != value) {
        setting = value;
        m_dirty = true;
    }
}

void LogConfig::set_md(bool save) {
    change(m_md, save);
}

void LogConfig::set_md_int_stor(bool internal) {
    change(m_md_int_stor, internal);
}

void LogConfig::set_log_file_size(uint32_t mb) {
    change(m_log_file_size, mb);
}

void LogConfig::set_data_log_size(uint32_t mb) {
    change(m_data_log_size, mb);
}

void LogConfig::set_sd_log_size(uint32_t mb) {
    change(m_sd_log_size, mb);
}

void LogConfig::set_log_overwrite(bool overwrite) {
    change(m_log_overwrite, overwrite);
}

LogConfig::ConfigEntry* LogConfig::stream_entry(CpType type) const {
    for (ConfigEntry* entry : m_streams) {
        if (entry->type == type) {
            return entry;
        }
    }
    return nullptr;
}

const LogConfig::ConfigEntry* LogConfig::find_stream(CpType type) const {
    return stream_entry(type);
}

void LogConfig::set_stream(CpType type, bool enable) {
    ConfigEntry* entry = stream_entry(type);
    if (entry) {
        change(entry->enable, enable);
    }
}

LogConfig::IqEntry* LogConfig::iq_entry(CpType type) const {
    for (IqEntry* entry : m_iqs) {
        if (entry->type == type) {
            return entry;
        }
    }
    return nullptr;
}

bool LogConfig::wcdma_iq_enabled(CpType type) const {
    const IqEntry* entry = iq_entry(type);
    return entry && entry->wcdma;
}

void LogConfig::enable_iq(CpType type, int iq_type) {
    IqEntry* entry = iq_entry(type);
    if (!entry) {
        entry = new IqEntry{type, false, false};
        m_iqs.push_back(entry);
    }
    change(iq_type == IQ_GSM ? entry->gsm : entry->wcdma, true);
}

void LogConfig::disable_iq(CpType type, int iq_type) {
    IqEntry* entry = iq_entry(type);
    if (entry) {
        change(iq_type == IQ_GSM ? entry->gsm : entry->wcdma, false);
    }
}

bool LogConfig::get_sd_root() {
    char type[PROPERTY_VALUE_MAX];
    property_get(PROP_STORAGE_TYPE, type, "");
    if (!type[0]) {
        err_log("persist.storage.type non exist");
        return false;
    }
    const char* root;
    switch (strtoul(type, nullptr, 0)) {
        case 1:
            root = getenv(ENV_EXTERNAL_STORAGE);
            if (!root) {
                err_log("no EXTERNAL_STORAGE");
                return false;
            }
            break;
        case 2:
            root = getenv(ENV_SECONDARY_STORAGE);
            if (!root) {
                err_log("no SECONDARY_STORAGE");
                return false;
            }
            break;
        default:
            err_log("unexpected persist.storage.type %s", type);
            return false;
    }
    m_sd_root = root;
    return true;
}

void LogConfig::propget_wan_modem_type() {
    // The first that is "1" decides.
    static const struct {
        const char* prop;
        CpType type;
    } MODES[] = {{PROP_TD_ENABLE, CT_TD},
                 {PROP_WCDMA_ENABLE, CT_WCDMA},
                 {PROP_5MODE_ENABLE, CT_5MODE},
                 {PROP_4MODE_ENABLE, CT_4MODE},
                 {PROP_3MODE_ENABLE, CT_3MODE}};

    for (const auto& mode : MODES) {
        char value[PROPERTY_VALUE_MAX];
        property_get(mode.prop, value, "");
        if (strcmp(value, "1") == 0) {
            s_wan_modem_type = mode.type;
            return;
        }
    }
    if (s_wan_modem_type == CT_UNKNOWN) {
        err_log("modem type unkown");
    }
}

int LogConfig::get_dev_paths(CpType type, bool& same, String8& log_path, String8& diag_path) {
    char log[PROPERTY_VALUE_MAX] = "";
    char diag[PROPERTY_VALUE_MAX] = "";
    if (const char* prop = cp_log_prop(type)) {
        property_get(prop, log, "");
    }
    if (const char* prop = cp_diag_prop(type)) {
        property_get(prop, diag, "");
    }

    switch (type) {
        case CT_WCDMA:
        case CT_WCN:
        case CT_GNSS:
            // The diag device is a must; without a log device of its own it carries all.
            if (!diag[0]) {
                return -1;
            }
            same = !log[0] || strcmp(log, diag) == 0;
            log_path = same ? diag : log;
            diag_path = same ? "" : diag;
            return 0;
        case CT_TD:
        case CT_3MODE:
        case CT_4MODE:
        case CT_5MODE:
            // Both are a must. An unknown diag device also withdraws the log device.
            if (!log[0]) {
                return -1;
            }
            log_path = diag[0] ? log : "";
            if (!diag[0]) {
                return -1;
            }
            same = false;
            diag_path = diag;
            return 0;
        case CT_AGDSP:
            same = true;
            log_path = system_path(PATH_AGDSP_LOG);
            diag_path = "";
            return 0;
        default:
            return -1;
    }
}
