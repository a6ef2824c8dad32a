// SPDX-License-Identifier: Apache-2.0

#include "kestctl/SettingsFile.h"

#include <errno.h>
#include <stdio.h>
#include <string.h>

#include "config/LogConfig.h"
#include "config/config_text.h"
#include "core/open_file.h"
#include "core/system_paths.h"

bool FileSettings::read(std::string* reason) {
    const android::String8 path = system_path(PATH_CONFIG_FILE);
    const int fd = open_to_read(path.string(), Links::FOLLOW);
    FILE* const file = fd < 0 ? nullptr : fdopen(fd, "r");
    bool good = file != nullptr;
    if (good) {
        char line[CONFIG_LINE_SIZE];
        while (fgets(line, sizeof(line), file)) {
            take_line(line);
        }
        good = ferror(file) == 0;
    }
    if (!good) {
        *reason = std::string("cannot read ") + path.string() + " (" + strerror(errno) + ")";
    }
    if (file) {
        fclose(file);
    }
    return good;
}

void FileSettings::take_line(const char* line) {
    ConfigToken keyword;
    ConfigToken state;
    if (!next_token(line, keyword)) {
        return;
    }
    if (keyword.is("iq")) {
        take_iq(keyword.end());
    } else if (keyword.is("minidump") && next_token(keyword.end(), state)) {
        md = state.is("enable");
    }
}

void FileSettings::take_iq(const char* rest) {
    ConfigToken token;
    if (!next_token(rest, token)) {
        return;
    }
    const CpType cp = cp_type_from_name(token.text, token.len);
    bool gsm = false;
    bool wcdma = false;
    while (next_token(token.end(), token)) {
        const int type = LogConfig::iq_type_from_name(token.text, token.len);
        if (type < 0) {
            return;  // one unknown word makes the whole line invalid
        }
        (type == LogConfig::IQ_GSM ? gsm : wcdma) = true;
    }
    // Of two lines for one CP the first counts.
    if (cp != CT_UNKNOWN && iq[cp].empty()) {
        iq[cp] = gsm && wcdma ? "GSM WCDMA" : gsm ? "GSM" : wcdma ? "WCDMA" : "";
    }
}
