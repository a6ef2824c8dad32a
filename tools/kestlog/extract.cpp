// SPDX-License-Identifier: Apache-2.0
// kestlog extract.
#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <deque>
#include <nlohmann/json.hpp>
#include <unordered_set>

#include "channels/modem_dump_end.h"
#include "common/text.h"
#include "core/open_file.h"
#include "kestlog/Commands.h"
#include "kestlog/DspDumps.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/LogStream.h"
#include "kestlog/OutputFile.h"
#include "kestlog/Problems.h"
#include "kestlog/Progress.h"
#include "kestlog/SplitFrame.h"
#include "kestlog/TreeInput.h"
#include "kestlog/option_numbers.h"

namespace {

constexpr int ANY = -1;

// What of a file goes to one file.
struct Content {
    const char* words;
    std::string suffix;  // of the output's name
    int type;
    int sub_type;
};

// The diag types and sub-type of data that the service asks for.
constexpr int RING_BUFFER = 0x3a;
constexpr int SLEEP_LOG = 0x3b;
constexpr int DATA = 0x64;

bool is_end(const Piece& piece) {
    return piece.data_len == MODEM_DUMP_END_LEN &&
           memcmp(piece.data, MODEM_DUMP_END, MODEM_DUMP_END_LEN) == 0;
}

// A file that holds nothing but payload already.
bool is_plain(const FileName& name) {
    return name.type == LT_RINGBUF || name.type == LT_SLEEP_LOG ||
           (name.type == LT_DUMP && !name.framed_dump);
}

bool holds_frames(const FileName& name) {
    return name.is_log() || name.framed_dump || !name.exact;
}

// The end marker of a dump. In a file of an unknown name it may count as a broken frame.
struct End {
    bool seen = false;
    uint64_t counted = 0;  // among the intact frames
};

struct Part {
    Content content;
    OutputFile out;
    uint64_t frames = 0;
    uint64_t bytes = 0;
};

class Extractor {
public:
    explicit Extractor(const CommandLine& line)
        : m_dir(line.value("output", "")),
          m_force(line.has("force")),
          m_problems(line.has("json"), stdout) {}

    bool read_options(const CommandLine& line, int* status) {
        if (m_dir.empty()) {
            *status = line.usage_error("-o DIR is missing");
            return false;
        }
        if (m_dir == "-") {
            *status = line.usage_error("extract writes files, not standard output: give -o DIR");
            return false;
        }
        return read_type(line, "type", &m_type, status) &&
               read_type(line, "sub-type", &m_sub_type, status);
    }

    // False when the output failed; *status is set then.
    bool extract(const LogTree& tree, int* status) {
        const NextLogs next(log_streams(tree));
        // A handset after the other: one dump is written at a time, and may go over its sets.
        std::vector<const TreeSet*> sets;
        for (const TreeSet& set : tree.sets) {
            sets.push_back(&set);
        }
        std::stable_sort(sets.begin(), sets.end(), [](const TreeSet* a, const TreeSet* b) {
            return a->handset < b->handset;
        });
        for (size_t i = 0; i < sets.size(); ++i) {
            for (const TreeCp& cp : sets[i]->cps) {
                if (!extract(*sets[i], cp, next, status)) {
                    return false;
                }
            }
            const bool last = i + 1 == sets.size() || sets[i]->handset != sets[i + 1]->handset;
            if (last && !finish_dump(status)) {
                return false;
            }
        }
        return true;
    }

    uint64_t outputs() const { return m_outputs.size(); }
    int status() const { return m_problems.status(); }

private:
    bool is_chosen() const { return m_type != ANY || m_sub_type != ANY; }

    bool extract(const TreeSet& set, const TreeCp& cp, const NextLogs& next, int* status) {
        const std::vector<const TreeFile*> logs = logs_in_order(cp);
        for (size_t i = 0; i < logs.size(); ++i) {
            m_next = next.after(cp, logs, i);
            if (!extract({&set, &cp, logs[i]}, status)) {
                return false;
            }
        }
        m_next = nullptr;
        return std::all_of(cp.files.begin(), cp.files.end(), [&](const TreeFile& file) {
            return file.name.is_log() || extract({&set, &cp, &file}, status);
        });
    }

    static Links links_of(const StreamFile& place) {
        return place.set->given ? Links::FOLLOW : Links::REFUSE;
    }

    bool extract(const StreamFile& place, int* status) {
        const TreeFile& file = *place.file;
        if (is_plain(file.name) && !is_chosen()) {
            return copy(file, links_of(place), status);
        }
        return !holds_frames(file.name) || scan(place, status);
    }

    std::vector<Content> contents(const FileName& name, bool chunked) const {
        if (is_chosen()) {
            char suffix[40] = "";
            size_t len = 0;
            if (m_type != ANY) {
                len += static_cast<size_t>(snprintf(suffix, sizeof(suffix), ".type-%02x", m_type));
            }
            if (m_sub_type != ANY) {
                snprintf(suffix + len, sizeof(suffix) - len, ".sub-type-%02x", m_sub_type);
            }
            return {{"payload", suffix, m_type, m_sub_type}};
        }
        if (chunked) {
            return {};  // see take_dump()
        }
        if (name.is_log()) {
            return {{"ring buffer", ".ringbuf", RING_BUFFER, DATA},
                    {"sleep log", ".sleeplog", SLEEP_LOG, DATA}};
        }
        return {{"memory image", name.exact ? "" : ".image", ANY, ANY}};
    }

    static std::string stem_of(const FileName& file) {
        const std::string name = file.text() == "-" ? "stdin" : file.text();
        const size_t dot = name.rfind('.');
        return dot == 0 ? name : name.substr(0, dot);
    }

    // Where it goes: no two outputs of one run have the same name. Of the names only hashes are
    // kept; where two have the same, the worst is a number that was not needed.
    std::string output_path(const std::string& stem, const std::string& suffix) {
        std::string output = output_name(stem, suffix + ".bin");
        if (output != m_last) {
            m_last = output;
            m_last_number = 0;
        }
        while (!m_outputs.insert(std::hash<std::string>()(output)).second) {
            output = output_name(stem, suffix + "-" + std::to_string(++m_last_number) + ".bin");
        }
        return m_dir + "/" + output;
    }

    bool open(const std::string& stem, const std::string& suffix, OutputFile* out) {
        if (m_outputs.empty()) {
            mkdir(m_dir.c_str(), 0777);  // if it cannot be made, the file in it cannot either
        }
        return out->open(output_path(stem, suffix), m_force);
    }

    bool take(const TreeFile& file, const Piece& piece, Part* part) {
        const Content& content = part->content;
        if (!piece.intact || (content.type != ANY && content.type != piece.type) ||
            (content.sub_type != ANY && content.sub_type != piece.sub_type)) {
            return true;
        }
        if (part->frames == 0 && !open(stem_of(file.name), content.suffix, &part->out)) {
            return false;
        }
        ++part->frames;
        part->bytes += piece.data_len;
        return part->out.write(piece.data, piece.data_len);
    }

    // A dump of an audio DSP goes over files. It is named as those of other CPs are.
    bool take_dump(const TreeFile& file, const Piece& piece) {
        if (!m_dumps.take(piece)) {
            return !m_dump_failed;
        }
        const bool named = file.name.is_log();
        const std::string stem =
            named ? file.name.cp() + "_memory_" + file.name.time().file_stamp().string()
                  : stem_of(file.name);
        m_dump_failed =
            m_dump_failed ||
            (m_dumps.dump().chunks == 1 && !open(stem, named ? "" : ".dump", &m_dump)) ||
            !m_dump.write(piece.data, piece.data_len);
        if (m_dumps.dump().has_end) {
            m_dumps.finish();
        }
        return !m_dump_failed;
    }

    // It has ended, or nothing more of it is there.
    void end_dump(const DspDump& dump) {
        m_dump_failed = m_dump_failed || !m_dump.close();
        if (!m_dump_failed) {
            print(dump);
        }
    }

    bool finish_dump(int* status) {
        m_dumps.finish();
        *status = m_dump_failed ? m_dump.failed() : *status;
        return !m_dump_failed;
    }

    bool scan(const StreamFile& place, int* status) {
        const TreeFile& file = *place.file;
        const std::string path = file.shown();
        LogReader in;
        if (!in.open(file.path(), place.set->given)) {
            m_problems.unreadable(path, errno);
            return true;
        }
        std::deque<Part> parts;
        const bool chunked = is_chunked(in, file.name);
        for (const Content& content : contents(file.name, chunked)) {
            parts.emplace_back();
            parts.back().content = content;
        }
        // What is no log file stands alone.
        const bool alone = chunked && !file.name.is_log();
        if (alone && !finish_dump(status)) {
            return false;
        }
        if (chunked) {
            m_dumps.enter(place);
        }
        FileReport report;
        const Part* failed = nullptr;
        End end;
        const auto take_all = [&](const Piece& piece) {
            for (Part& part : parts) {
                failed = !failed && !take(file, piece, &part) ? &part : failed;
            }
            return !failed;
        };
        scan_file(
            in, file.name,
            [&](const Piece& piece) {
                if (!file.name.is_log() && !piece.kind && is_end(piece)) {
                    end.seen = true;
                    end.counted += piece.intact ? 1 : 0;
                    return true;
                }
                return piece.kind && !is_chosen() ? take_dump(file, piece) : take_all(piece);
            },
            FP_DATA, &report);
        m_split.end_file(file, in.size(), failed ? nullptr : m_next, take_all, &report,
                         links_of(place));
        for (Part& part : parts) {
            failed = !failed && part.frames > 0 && !part.out.close() ? &part : failed;
        }
        if (failed || m_dump_failed) {
            *status = (failed ? failed->out : m_dump).failed();
            return false;
        }
        for (const Part& part : parts) {
            if (part.frames > 0) {
                print(path, part, report, end);
            }
        }
        tell(path, report, in.error());
        return !alone || finish_dump(status);
    }

    void tell(const std::string& path, const FileReport& report, int error) {
        for (const Finding& finding : report.findings) {
            if (finding.damage) {
                m_problems.add(path, {finding});
            }
        }
        if (error) {
            m_problems.unreadable(path, error);
        }
    }

    // A file that has no frames.
    bool copy(const TreeFile& file, Links links, int* status) {
        const std::string path = file.shown();
        const int fd = open_to_read(file.path().c_str(), links);
        if (fd < 0) {
            m_problems.unreadable(path, errno);
            return true;
        }
        OutputFile out;
        uint64_t copied = 0;
        int error = 0;
        const bool good = open(stem_of(file.name), "", &out) &&
                          out.copy_from(fd, file.size, &copied, &error) && out.close();
        close(fd);
        if (!good) {
            *status = out.failed();
            return false;
        }
        FileReport report;
        if (error == 0 && copied < file.size) {
            report.add(true, "cut", "became shorter while it was read");
        }
        if (m_problems.json()) {
            m_problems.print({{"file", json_text(path)},
                              {"output", json_text(out.path())},
                              {"content", file.name.kind()},
                              {"framed", false},
                              {"bytes", copied}});
        } else {
            printf("%s: %s, %llu bytes; it has no frames%s\n", escape_text(out.path()).c_str(),
                   file.name.kind(), static_cast<unsigned long long>(copied),
                   copied < file.size ? "" : ", nothing was left out");
        }
        tell(path, report, error);
        return true;
    }

    void print(const DspDump& dump) {
        const char* const content = dump.is_whole() ? "memory image" : "part of a memory image";
        if (m_problems.json()) {
            m_problems.print({{"file", json_text(dump.files[0].file->shown())},
                              {"output", json_text(m_dump.path())},
                              {"content", content},
                              {"framed", true},
                              {"bytes", dump.bytes},
                              {"frames", dump.chunks},
                              {"other_frames", dump.others},
                              {"files", dump.files.size()},
                              {"missing_frames", dump.missing},
                              {"has_start", dump.has_start},
                              {"has_end", dump.has_end}});
            return;
        }
        const std::string missing = dump.missing_words();
        printf("%s: %s, %llu bytes of %llu chunks in %zu files; left out: %s%s%s\n",
               escape_text(m_dump.path()).c_str(), content,
               static_cast<unsigned long long>(dump.bytes),
               static_cast<unsigned long long>(dump.chunks), dump.files.size(),
               dump.others ? (std::to_string(dump.others) + " other chunks").c_str() : "nothing",
               missing.empty() ? "" : "; missing: ", missing.c_str());
    }

    void print(const std::string& path, const Part& part, const FileReport& report,
               const End& end) {
        uint64_t all = report.frames;
        for (const auto& chunks : report.chunks) {
            all += chunks.count;
        }
        const uint64_t others = all - part.frames - end.counted;
        if (m_problems.json()) {
            m_problems.print({{"file", json_text(path)},
                              {"output", json_text(part.out.path())},
                              {"content", part.content.words},
                              {"framed", true},
                              {"bytes", part.bytes},
                              {"frames", part.frames},
                              {"other_frames", others},
                              {"broken_frames", report.broken},
                              {"other_bytes", report.other},
                              {"time_record", report.has_record},
                              {"end_marker", end.seen}});
            return;
        }
        const char* const frames = report.chunked ? " chunks" : " frames";
        std::string left_out;
        const auto add = [&](bool any, const std::string& words) {
            left_out += any ? (left_out.empty() ? "" : ", ") + words : "";
        };
        add(others > 0, std::to_string(others) + " other" + frames);
        add(report.broken > 0, std::to_string(report.broken) + " broken frames");
        add(report.other > 0, std::to_string(report.other) + " bytes outside intact" + frames);
        add(report.has_record, "the time record");
        add(end.seen, "the end marker");
        printf("%s: %s, %llu bytes of %llu%s; left out: %s\n", escape_text(part.out.path()).c_str(),
               part.content.words, static_cast<unsigned long long>(part.bytes),
               static_cast<unsigned long long>(part.frames), frames,
               left_out.empty() ? "nothing" : left_out.c_str());
    }

    std::string m_dir;
    bool m_force;
    Problems m_problems;
    int m_type = ANY;
    int m_sub_type = ANY;
    std::unordered_set<size_t> m_outputs;
    std::string m_last;     // output without a number: one file may hold very many dumps
    int m_last_number = 0;  // that it got last
    OutputFile m_dump;
    bool m_dump_failed = false;
    DspDumps m_dumps{[this](const DspDump& dump) { end_dump(dump); }};
    SplitFrame m_split;
    const TreeFile* m_next = nullptr;  // the log file that goes on where the one in hand ends
};

}  // namespace

int run_extract(const CommandLine& line) {
    Extractor extractor(line);
    LogTree tree;
    int status;
    if (!extractor.read_options(line, &status) ||
        !open_tree(line, &tree, &status, LogTree::FILES_TOO)) {
        return status;
    }
    const Progress progress(tree.size(), true);
    if (!extractor.extract(tree, &status)) {
        return status;
    }
    status = std::max(extractor.status(), tell_failures(tree));
    if (extractor.outputs() == 0 && status == ES_OK) {
        status = failure(ES_UNREADABLE, "found nothing to extract");
    }
    return status;
}
