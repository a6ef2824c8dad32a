#include "kestlog/Report.h"

#include <errno.h>
#include <stdio.h>
#include <string.h>

#include "common/text.h"
#include "kestlog/ExitStatus.h"

Json& Json::raw(const char* key, const std::string& json) {
    m_text += (m_text.size() > 1 ? "," : "") + json_string(key) + ":" + json;
    return *this;
}

Json& Json::add(const char* key, const std::string& text) {
    return raw(key, json_string(text));
}

Json& Json::add(const char* key, uint64_t number) {
    return raw(key, std::to_string(number));
}

Json& Json::add(const char* key, bool value) {
    return raw(key, value ? "true" : "false");
}

void Json::print() const {
    printf("%s\n", str().c_str());
}

std::string json_array(const std::vector<std::string>& elements) {
    std::string text;
    for (const std::string& element : elements) {
        text += (text.empty() ? "[" : ",") + element;
    }
    return text.empty() ? "[]" : text + "]";
}

Json finding_json(const Finding& finding) {
    Json json;
    json.add("damage", finding.damage).add("code", finding.code).add("meaning", finding.words);
    if (finding.offset >= 0) {
        json.add("offset", static_cast<uint64_t>(finding.offset));
    }
    return json;
}

std::string finding_text(const Finding& finding) {
    return (finding.damage ? "damage: " : "note: ") + escape_text(finding.words) +
           (finding.offset >= 0 ? " (at byte " + std::to_string(finding.offset) + ")" : "");
}

int failure(int status, const std::string& words) {
    fprintf(stderr, "kestlog: %s\n", escape_text(words).c_str());
    return status;
}

int open_input(LogReader& in, const std::string& path) {
    return in.open(path, true) ? ES_OK : failure(ES_UNREADABLE, path + ": " + strerror(errno));
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
