// SPDX-License-Identifier: Apache-2.0
// kestlog split.
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include <nlohmann/json.hpp>

#include "common/CommandLine.h"
#include "common/text.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/Report.h"

namespace {

// The file that one kind of data goes to.
struct Part {
    std::string path;
    FILE* file = nullptr;

    bool open(bool force) {
        // Deleted first, not overwritten: an old file may be a link to anything.
        if (force && unlink(path.c_str()) < 0 && errno != ENOENT) {
            return false;
        }
        const int fd = ::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644);
        file = fd < 0 ? nullptr : fdopen(fd, "wb");
        return file != nullptr;
    }
    bool close() {
        const bool good = !file || fclose(file) == 0;
        file = nullptr;
        return good;
    }
};

int give_up(Part (&parts)[CK_NUM], const Part& failed, int error) {
    for (Part& part : parts) {
        if (part.file) {
            part.close();
            unlink(part.path.c_str());
        }
    }
    return failure(ES_OUTPUT, failed.path + ": " + strerror(error) +
                                  (error == EEXIST ? "; use --force to replace it" : ""));
}

int kind_index(const char* kind) {
    int i = 0;
    while (CHUNK_KINDS[i] != kind) {
        ++i;
    }
    return i;
}

void print_result(bool json, const std::string& path, const Part (&parts)[CK_NUM],
                  const FileReport& report) {
    Json object = {{"file", json_text(path)}};
    for (int i = 0; i < CK_NUM; ++i) {
        if (json) {
            object[CHUNK_KINDS[i]] = {{"path", json_text(parts[i].path)},
                                      {"chunks", report.chunks[i].count},
                                      {"bytes", report.chunks[i].bytes}};
        } else {
            printf("%s: %llu chunks, %llu bytes\n", escape_text(parts[i].path).c_str(),
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

}  // namespace

int run_split(const CommandLine& line) {
    const std::string path = line.params()[0];
    LogReader in;
    if (const int status = open_input(in, path)) {
        return status;
    }
    const FileName name(file_part(path));
    std::string stem = name.text;
    if (stem.size() > 4 && stem.compare(stem.size() - 4, 4, ".log") == 0) {
        stem.resize(stem.size() - 4);
    }
    if (!is_chunked(in, name)) {
        return failure(ES_UNREADABLE, path + ": not a log of the audio DSP");
    }
    Part parts[CK_NUM];
    for (int i = 0; i < CK_NUM; ++i) {
        parts[i].path = line.value("output", ".") + "/" + stem + "." + CHUNK_KINDS[i] + ".bin";
        if (!parts[i].open(line.has("force"))) {
            return give_up(parts, parts[i], errno);
        }
    }
    const Part* failed = nullptr;
    int error = 0;
    const PieceVisitor write = [&](const Piece& piece) {
        Part& part = parts[kind_index(piece.kind)];
        if (fwrite(piece.data, 1, piece.data_len, part.file) != piece.data_len) {
            error = errno;
            failed = &part;
        }
        return !failed;
    };
    FileReport report;
    scan_file(in, name, write, &report);
    for (Part& part : parts) {
        if (!failed && fflush(part.file) != 0) {
            error = errno;
            failed = &part;
        }
    }
    if (failed) {
        return give_up(parts, *failed, error);
    }
    for (Part& part : parts) {
        if (!part.close()) {
            return failure(ES_OUTPUT, part.path + ": " + strerror(errno));
        }
    }
    print_result(line.has("json"), path, parts, report);
    tell_damage(path, report);
    return scan_status(in, path, report);
}
