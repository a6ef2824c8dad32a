// SPDX-License-Identifier: Apache-2.0
// kestlog join.
#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <nlohmann/json.hpp>

#include "common/text.h"
#include "core/open_file.h"
#include "kestlog/ChunkSequence.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/OutputFile.h"
#include "kestlog/Problems.h"
#include "kestlog/Progress.h"
#include "kestlog/Report.h"
#include "kestlog/StreamPlan.h"
#include "kestlog/TreeInput.h"
#include "kestlog/option_numbers.h"

namespace {

class Joiner {
public:
    Joiner(const CommandLine& line, OutputFile* out)
        : m_records(line.has("records")),
          m_kind(line.value("kind", "")),
          m_out(*out),
          m_problems(line.has("json"), out->is_standard() ? stderr : stdout) {}

    // False when the output failed.
    bool join(const std::vector<PlannedFile>& plan) {
        for (const PlannedFile& each : plan) {
            const std::string path = each.file->shown();
            m_problems.add(path, each.findings);
            if (each.left_out) {
                ++m_left_out;
                continue;
            }
            const bool chunked = each.file->name.cp_type == CT_AGDSP;
            if ((chunked && !take_chunks(each, path)) ||
                (m_kind.empty() && !copy(*each.file, path))) {
                return false;
            }
        }
        return true;
    }

    int finish(const std::string& cp) const {
        const char* const output = m_out.path().c_str();
        if (m_problems.json()) {
            m_problems.print({{"cp", json_text(cp)},
                              {"output", json_text(output)},
                              {"files", m_files},
                              {"left_out", m_left_out},
                              {"bytes", m_bytes},
                              {"damages", m_problems.damages()},
                              {"notes", m_problems.notes()}});
        } else if (!m_out.is_standard()) {
            printf("%s: %s, %llu files, %llu bytes\n", escape_text(output).c_str(),
                   escape_text(cp).c_str(), static_cast<unsigned long long>(m_files),
                   static_cast<unsigned long long>(m_bytes));
        }
        return m_problems.status();
    }

private:
    bool unreadable(const std::string& path, int error) {
        m_problems.unreadable(path, error);
        return true;
    }

    // The file as it stands, without its time record.
    bool copy(const TreeFile& file, const std::string& path) {
        const int fd = open_to_read(file.path().c_str(), Links::REFUSE);
        if (fd < 0) {
            return unreadable(path, errno);
        }
        const bool good = copy_open(fd, file, path);
        close(fd);
        return good;
    }

    bool copy_open(int fd, const TreeFile& file, const std::string& path) {
        uint8_t head[sizeof(TimeSyncRecord)];
        struct stat st;
        const ssize_t got = pread(fd, head, sizeof(head), 0);
        if (got < 0 || fstat(fd, &st) < 0) {
            return unreadable(path, errno);
        }
        ++m_files;
        bool cut;
        const size_t record = time_record_len(head, static_cast<size_t>(got), file.name, &cut);
        if (record > 0 && cut && file.name.cp_type != CT_AGDSP) {
            m_problems.add(path, {{true, "record", "the time record is cut off", 0}});
        }
        const size_t skipped = m_records ? 0 : record;
        const uint64_t left = static_cast<uint64_t>(st.st_size) -
                              std::min<uint64_t>(static_cast<uint64_t>(st.st_size), skipped);
        uint64_t copied;
        int error;
        if (lseek(fd, static_cast<off_t>(skipped), SEEK_SET) < 0 ||
            !m_out.copy_from(fd, left, &copied, &error)) {
            return false;
        }
        m_bytes += copied;
        if (error) {
            return unreadable(path, error);
        }
        if (copied < left) {
            m_problems.add(path, {{true, "cut", "became shorter while it was read", -1}});
        }
        return true;
    }

    // An audio DSP's file: looks for damage and, with --kind, writes the data of its chunks.
    bool take_chunks(const PlannedFile& each, const std::string& path) {
        LogReader in;
        if (!in.open(each.file->path(), false)) {
            return m_kind.empty() || unreadable(path, errno);  // else copy() tells
        }
        m_files += m_kind.empty() ? 0 : 1;  // else copy() counts it
        FileReport report;
        bool good = true;
        m_sequence.enter(*each.file->dir);
        scan_file(
            in, each.file->name,
            [&](const Piece& piece) {
                m_sequence.take(piece, &report);
                if (m_kind == piece.kind) {
                    good = m_out.write(piece.data, piece.data_len);
                    m_bytes += piece.data_len;
                }
                return good;
            },
            FP_LENGTH, &report);
        for (Finding& finding : report.findings) {
            // Only the last file of all may still be written to.
            finding.damage |= strcmp(finding.code, "cut") == 0 && !each.last;
        }
        m_problems.add(path, report, m_kind.empty() ? 0 : in.error());
        return good;
    }

    bool m_records;
    std::string m_kind;
    OutputFile& m_out;
    Problems m_problems;
    ChunkSequence m_sequence;
    uint64_t m_files = 0;
    uint64_t m_left_out = 0;
    uint64_t m_bytes = 0;
};

// False, with the exit status in *status, when --kind cannot be meant.
bool check_kind(const CommandLine& line, const LogStream& stream, int* status) {
    if (!line.has("kind")) {
        return true;
    }
    if (!check_word(line, "kind", {std::begin(CHUNK_KINDS), std::end(CHUNK_KINDS)}, status)) {
        return false;
    }
    if (cp_type_of(stream.cp) != CT_AGDSP) {
        *status = line.usage_error("--kind is for the log of an audio DSP");
        return false;
    }
    return true;
}

}  // namespace

int run_join(const CommandLine& line) {
    LogTree tree;
    int status;
    if (!takes_binary(line, &status) || !open_tree(line, &tree, &status)) {
        return status;
    }
    const std::vector<LogStream> streams = log_streams(tree);
    const LogStream* const stream = choose_stream(line, streams, &status);
    if (!stream || !check_kind(line, *stream, &status)) {
        return std::max(status, tell_failures(tree));
    }
    OutputFile out;
    if (!out.open(line.value("output", "-"), line.has("force"))) {
        return out.failed();
    }
    uint64_t size = 0;
    for (const StreamFile& each : stream->files) {
        size += each.file->size;
    }
    const Progress progress(size, out.is_standard());
    Joiner joiner(line, &out);
    if (!joiner.join(plan_stream(*stream)) || !out.close()) {
        return out.failed();
    }
    return std::max(joiner.finish(stream->cp), tell_failures(tree));
}
