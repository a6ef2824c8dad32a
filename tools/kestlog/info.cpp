// SPDX-License-Identifier: Apache-2.0
// kestlog info.
#include <stdio.h>

#include <algorithm>
#include <nlohmann/json.hpp>

#include "common/CommandLine.h"
#include "common/text.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/Report.h"
#include "kestlog/small_files.h"

namespace {

// Facts in order, for both forms of output.
class Facts {
public:
    explicit Facts(bool json) : m_json(json) {}

    void add(const std::string& key, const std::string& value) {
        add(key, json_text(value), value);
    }
    void add(const std::string& key, uint64_t value) { add(key, value, std::to_string(value)); }
    void add(const std::string& key, bool value) { add(key, value, value ? "yes" : "no"); }
    Json& object() { return m_object; }

private:
    void add(std::string key, const Json& value, const std::string& words) {
        if (!m_json) {
            printf("%-15s %s\n", key.c_str(), escape_text(words).c_str());
            return;
        }
        std::replace(key.begin(), key.end(), ' ', '_');
        m_object[key] = value;
    }

    bool m_json;
    Json m_object;
};

// The record's seconds are local time already.
std::string wall_clock(const TimeSyncRecord& record) {
    const time_t seconds = static_cast<time_t>(record.seconds);
    struct tm t;
    return gmtime_r(&seconds, &t) ? time_text(LogTime::from_tm(t)) : "-";
}

std::string cp_time(const TimeSyncRecord& record) {
    std::string text;
    for (uint8_t byte : record.cp_time) {
        char hex[3];
        snprintf(hex, sizeof(hex), "%02x", byte);
        text += hex;
    }
    return text;
}

void add_content(Facts* facts, const FileName& name, const FileReport& report) {
    if (!report.scanned) {
        return;
    }
    if (report.has_record) {
        facts->add("time record", wall_clock(report.record));
        facts->add("cp time", cp_time(report.record));
    }
    if (report.chunked) {
        for (int i = 0; i < CK_NUM; ++i) {
            const std::string kind = CHUNK_KINDS[i];
            facts->add(kind + " chunks", report.chunks[i].count);
            facts->add(kind + " bytes", report.chunks[i].bytes);
        }
        facts->add("sequence gaps", report.sequence_gaps);
    } else {
        facts->add("frames", report.frames);
        facts->add("broken frames", report.broken);
    }
    facts->add("payload", report.payload);
    facts->add("other bytes", report.other);
    if (name.framed_dump) {
        facts->add("end marker", report.end_marker);
    }
}

void add_findings(Facts* facts, bool json, const FileReport& report) {
    Json objects = Json::array();
    for (const Finding& finding : report.findings) {
        if (json) {
            objects.push_back(finding_json(finding));
        } else {
            printf("%s\n", escape_text(finding_text(finding)).c_str());
        }
    }
    if (json) {
        facts->object()["findings"] = objects;
    }
    if (report.more_findings) {
        facts->add("more findings", report.more_findings);
    }
}

int info(const CommandLine& line, const std::string& path) {
    LogReader in;
    if (const int status = open_input(in, path)) {
        return status;
    }
    const FileName name(file_part(path));
    const std::string version = peek_version(in);
    FileReport report;
    scan_file(in, name, nullptr, FP_LENGTH, &report);
    in.drain();  // the size of a pipe shows at its end
    Facts facts(line.has("json"));
    facts.add("file", path);
    facts.add("kind", std::string(name.kind()));
    if (!name.cp().empty()) {
        facts.add("cp", name.cp());
    }
    if (name.is_log()) {
        facts.add("number", uint64_t{name.number});
    }
    if (has_time(name.time())) {
        facts.add("started", time_text(name.time()));
    }
    facts.add("size", in.size());
    if (name.type == LT_VERSION) {
        facts.add("version", version);
    }
    add_content(&facts, name, report);
    facts.add("damaged", report.damaged);
    add_findings(&facts, line.has("json"), report);
    if (!line.has("json")) {
        printf("%s", line.params().size() > 1 ? "\n" : "");
    } else {
        print_json(facts.object());
    }
    return scan_status(in, path, report);
}

}  // namespace

int run_info(const CommandLine& line) {
    return for_each_file(line, info);
}
