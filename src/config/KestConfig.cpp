// SPDX-License-Identifier: Apache-2.0

#include "config/KestConfig.h"

#include "config/ConfigReader.h"
#include "config/config_text.h"
#include "core/log.h"

KestConfig::KestConfig() : m_enable(false) {}

KestConfig::~KestConfig() {
    for (StreamEntry* entry : m_streams) {
        delete entry;
    }
}

int KestConfig::read_config(const char* path) {
    ConfigReader reader;
    if (reader.open(path) < 0) {
        err_log("can not open %s", path);
        return -1;
    }
    while (const char* line = reader.next_line()) {
        if (parse_line(line) < 0) {
            err_log("Invalid line: %d\n", reader.line_number());
        }
    }
    if (reader.failed()) {
        err_log("can not open %s", path);
        return -1;
    }
    if (!m_enable) {
        for (StreamEntry* entry : m_streams) {
            entry->enable = false;
        }
    }
    return 0;
}

int KestConfig::parse_line(const char* line) {
    ConfigToken keyword;
    if (!next_token(line, keyword) || keyword.text[0] == '#') {
        return 0;
    }
    if (keyword.is("stream")) {
        return parse_stream_line(keyword.end());
    }
    if (keyword.is("enable")) {
        m_enable = true;
    }
    return 0;
}

int KestConfig::parse_stream_line(const char* rest) {
    ConfigToken name;
    if (!next_token(rest, name)) {
        return -1;
    }
    const CpType type = cp_type_from_foreign_name(name.text, name.len);
    if (type == CT_UNKNOWN) {
        return 0;
    }
    bool enable;
    uint32_t size;
    uint32_t level;
    if (parse_stream_settings(name.end(), enable, size, level) < 0) {
        return -1;
    }
    m_streams.push_back(new StreamEntry{type, enable});
    return 0;
}
