// SPDX-License-Identifier: Apache-2.0
// kestlog split.
#include <stdio.h>
#include <sys/stat.h>

#include <nlohmann/json.hpp>
#include <set>

#include "common/CommandLine.h"
#include "common/text.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/OutputFile.h"
#include "kestlog/Report.h"

namespace {

int kind_index(const char* kind) {
    int i = 0;
    while (CHUNK_KINDS[i] != kind) {
        ++i;
    }
    return i;
}

void print_result(bool json, const std::string& path, const OutputFile (&parts)[CK_NUM],
                  const FileReport& report) {
    Json object = {{"file", json_text(path)}};
    for (int i = 0; i < CK_NUM; ++i) {
        if (json) {
            object[CHUNK_KINDS[i]] = {{"path", json_text(parts[i].path())},
                                      {"chunks", report.chunks[i].count},
                                      {"bytes", report.chunks[i].bytes}};
        } else {
            printf("%s: %llu chunks, %llu bytes\n", escape_text(parts[i].path()).c_str(),
                   static_cast<unsigned long long>(report.chunks[i].count),
                   static_cast<unsigned long long>(report.chunks[i].bytes));
        }
    }
    if (json) {
        object["sequence_gaps"] = report.sequence_gaps;
        object["other_bytes"] = report.other;
        object["damaged"] = report.damaged;
        print_json(object);
    } else {
        printf("%llu sequence gaps, %llu other bytes\n",
               static_cast<unsigned long long>(report.sequence_gaps),
               static_cast<unsigned long long>(report.other));
    }
}

typedef std::set<std::string> Names;

// Names the outputs of a file. Those of one run are never the same, as files from different
// directories may have one name: further ones get a number.
void name_parts(const std::string& stem, Names* taken, std::string (&names)[CK_NUM]) {
    Names added;
    for (uint64_t number = 0; added.size() < CK_NUM; ++number) {
        const std::string ending = (number ? "-" + std::to_string(number) : "") + ".bin";
        added.clear();
        for (int i = 0; i < CK_NUM; ++i) {
            names[i] = output_name(stem, std::string(".") + CHUNK_KINDS[i] + ending);
            if (taken->count(names[i]) == 0) {
                added.insert(names[i]);
            }
        }
    }
    taken->insert(added.begin(), added.end());
}

int split(const CommandLine& line, const std::string& path, Names* taken) {
    LogReader in;
    if (const int status = open_input(in, path)) {
        return status;
    }
    const FileName name(file_part(path));
    std::string stem = path == "-" ? "stdin" : name.text();
    if (stem != LOG_ENDING) {
        cut_ending(&stem, LOG_ENDING);
    }
    if (!is_chunked(in, name)) {
        return failure(ES_UNREADABLE, path + ": not a log of the audio DSP");
    }
    const std::string dir = line.value("output", ".");
    mkdir(dir.c_str(), 0777);  // if it cannot be made, the files in it cannot either
    const std::string before = dir + "/";
    std::string names[CK_NUM];
    name_parts(stem, taken, names);
    OutputFile parts[CK_NUM];
    for (int i = 0; i < CK_NUM; ++i) {
        if (!parts[i].open(before + names[i], line.has("force"))) {
            return parts[i].failed();
        }
    }
    const OutputFile* failed = nullptr;
    const PieceVisitor write = [&](const Piece& piece) {
        OutputFile& part = parts[kind_index(piece.kind)];
        failed = part.write(piece.data, piece.data_len) ? nullptr : &part;
        return !failed;
    };
    FileReport report;
    scan_file(in, name, write, FP_LENGTH, &report);
    for (OutputFile& part : parts) {
        if (!failed && fflush(part.stream()) != 0) {
            failed = &part;
            part.close();
        }
    }
    if (failed) {
        return failed->failed();
    }
    for (OutputFile& part : parts) {
        if (!part.close()) {
            return part.failed();
        }
    }
    print_result(line.has("json"), path, parts, report);
    tell_damage(path, report);
    return scan_status(in, path, report);
}

}  // namespace

int run_split(const CommandLine& line) {
    if (line.value("output", "") == "-") {
        return line.usage_error("split writes files, not standard output: give -o DIR");
    }
    Names taken;
    return for_each_file(line, [&taken](const CommandLine& each, const std::string& path) {
        return split(each, path, &taken);
    });
}
