// SPDX-License-Identifier: Apache-2.0

#include "kestlog/Report.h"

#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>

#include <algorithm>
#include <nlohmann/json.hpp>

#include "common/text.h"
#include "kestlog/Archive.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/OutputFile.h"
#include "kestlog/Progress.h"

std::string json_text(const std::string& text) {
    std::string utf8;
    for (const char c : text) {
        const unsigned int code = static_cast<uint8_t>(c);
        if (code < 0x80) {
            utf8 += c;
        } else {
            utf8 += static_cast<char>(0xc0 | (code >> 6));
            utf8 += static_cast<char>(0x80 | (code & 0x3f));
        }
    }
    return utf8;
}

std::string json_line(const Json& json) {
    return json.dump(-1, ' ', true);
}

void print_json(const Json& json) {
    Progress::clear();
    printf("%s\n", json_line(json).c_str());
}

Json finding_json(const Finding& finding) {
    Json json = {
        {"damage", finding.damage}, {"code", finding.code}, {"meaning", json_text(finding.words)}};
    if (finding.offset >= 0) {
        json["offset"] = finding.offset;
    }
    return json;
}

std::string finding_text(const Finding& finding) {
    return (finding.damage ? "damage: " : "note: ") + finding.words +
           (finding.offset >= 0 ? " (at byte " + std::to_string(finding.offset) + ")" : "");
}

int failure(int status, const std::string& words) {
    Progress::clear();
    fprintf(stderr, "kestlog: %s\n", escape_text(words).c_str());
    return status;
}

int open_input(LogReader& in, const std::string& path) {
    const std::string hint = "; ls, verify, report, join, extract, export, wav and bundle read it";
    if (path != "-" && is_archive(path)) {
        return failure(ES_UNREADABLE, path + ": It is an archive" + hint);
    }
    if (in.open(path, true)) {
        OutputFile::keep(path);
        return ES_OK;
    }
    return failure(ES_UNREADABLE,
                   path + ": " + (errno == EINVAL ? "neither a file nor a pipe" : strerror(errno)) +
                       (errno == EISDIR ? hint : ""));
}

int for_each_file(const CommandLine& line,
                  const std::function<int(const CommandLine& line, const std::string& path)>& run) {
    int status = ES_OK;
    const Progress progress(total_size(line.params()));
    for (const std::string& path : line.params()) {
        status = std::max(status, run(line, path));
    }
    return status;
}

uint64_t total_size(const Args& paths) {
    uint64_t total = 0;
    for (const std::string& path : paths) {
        struct stat st;
        if (stat(path.c_str(), &st) < 0 || !S_ISREG(st.st_mode)) {
            return 0;
        }
        total += static_cast<uint64_t>(st.st_size);
    }
    return total;
}

void tell_damage(const std::string& path, const FileReport& report) {
    for (const Finding& finding : report.findings) {
        if (finding.damage) {
            failure(ES_DAMAGE, path + ": " + finding_text(finding));
        }
    }
}

int scan_status(const LogReader& in, const std::string& path, const FileReport& report) {
    if (in.error()) {
        failure(ES_UNREADABLE, path + ": " + strerror(in.error()));
    }
    return report.damaged ? ES_DAMAGE : in.error() ? ES_UNREADABLE : ES_OK;
}

std::string file_part(const std::string& path) {
    return path.substr(path.rfind('/') + 1);
}
