// SPDX-License-Identifier: Apache-2.0
// kestlog's scanner of a log file: every byte is accounted for, and every piece is what stands
// at its place. A chunk of the audio DSP that the service writes is read back whole, and one
// that is cut is told.
#include <string.h>

#include <algorithm>
#include <string>
#include <vector>

#include "channels/DiagFrameParser.h"
#include "channels/DspChunkHeader.h"
#include "fuzz/fuzz.h"
#include "kestlog/FileScan.h"

namespace {

const char* const NAMES[] = {
    "0-cp_wcdma-2016-03-01_09-15-00.log",
    "cp_wcdma_memory_2016-03-01_09-15-00.dmp",
    "0-agdsp-2016-03-01_09-15-00.log",
    "7-agdsp-2016-03-01_09-15-00.log",
    "0-cp_gnss-2016-03-01_09-15-00.log",
    "cp_wcn_memory_2016-03-01_09-15-00.dmp",
    "cp_gnss.version",
    "sha1.txt",
    "anything",
};
constexpr size_t NAME_NUM = sizeof(NAMES) / sizeof(NAMES[0]);
constexpr size_t RECORD_LEN = 16;
const std::string RECORD_MAGIC("\x78\x56\x34\x12");

struct ScannedPiece {
    uint64_t offset;
    uint32_t seq_num;
    int type;  // and sub-type
    bool intact;
    size_t len;
    std::string kind;  // of a chunk
    std::string data;
};

struct Scanned {
    FileReport report;
    std::vector<ScannedPiece> pieces;
};

// The scan of a file of that name and content.
Scanned fuzz_scan(const std::string& name, const std::string& content,
                  FramePayload payload = FP_DATA) {
    static const FuzzFile file;
    file.write(content);
    Scanned result;
    LogReader in;
    FUZZ_CHECK(in.open(file.path, true));
    scan_file(
        in, FileName(name),
        [&](const Piece& piece) {
            result.pieces.push_back(
                {piece.offset, piece.seq_num, piece.type << 8 | piece.sub_type, piece.intact,
                 piece.data_len, piece.kind ? piece.kind : "",
                 piece.data ? fuzz_text(piece.data, piece.data_len) : std::string()});
            return true;
        },
        payload, &result.report);
    FUZZ_CHECK(in.error() == 0);
    return result;
}

uint64_t head(const FileReport& report) {
    return report.has_record ? RECORD_LEN : 0;
}

void check_findings(const FileReport& report, const std::string& content) {
    bool damage = false;
    for (const Finding& finding : report.findings) {
        damage |= finding.damage;
        FUZZ_CHECK(finding.offset >= -1 && finding.offset <= static_cast<int64_t>(content.size()));
        FUZZ_CHECK((strcmp(finding.code, "empty") == 0) == content.empty());
    }
    FUZZ_CHECK(report.findings.size() <= FileReport::MAX_FINDINGS);
    FUZZ_CHECK(report.damaged == damage || (report.damaged && report.more_findings > 0));
    FUZZ_CHECK(report.payload <= content.size() && report.other <= content.size());
}

void check_record(const FileReport& report, const std::string& content) {
    FUZZ_CHECK(!report.has_record || (content.compare(0, 4, RECORD_MAGIC) == 0 &&
                                      memcmp(&report.record, content.data(), RECORD_LEN) == 0));
}

void check_chunks(const Scanned& scan, const std::string& content) {
    uint64_t bytes = head(scan.report) + scan.report.other;
    uint64_t end = head(scan.report);
    uint64_t payload = 0;
    for (const ScannedPiece& piece : scan.pieces) {
        const auto at = static_cast<size_t>(piece.offset);
        FUZZ_CHECK(piece.intact && piece.offset >= end);
        FUZZ_CHECK(content.compare(at, 4, "~~~~") == 0);
        FUZZ_CHECK(content.compare(at + 20, piece.data.size(), piece.data) == 0);
        end = piece.offset + 20 + piece.data.size();
        bytes += 20 + piece.data.size();
        payload += piece.data.size();
    }
    FUZZ_CHECK(bytes == content.size() && payload == scan.report.payload);
}

void check_frames(const Scanned& scan, const std::string& content) {
    const bool escapes = content.find('\x7d') != std::string::npos;
    uint64_t intact = 0;
    uint64_t payload = 0;
    uint64_t start = 0;
    for (const ScannedPiece& piece : scan.pieces) {
        const auto at = static_cast<size_t>(piece.offset);
        FUZZ_CHECK(piece.offset >= start && piece.offset < content.size());
        FUZZ_CHECK(content[at] == '~' || escapes);
        start = piece.offset + 1;
        intact += piece.intact;
        payload += piece.intact ? piece.data.size() : 0;
        if (piece.intact && !escapes) {
            FUZZ_CHECK(content.compare(at + 9, piece.data.size() + 1, piece.data + "~") == 0);
        }
    }
    FUZZ_CHECK(scan.report.frames == intact && scan.report.payload == payload);
    FUZZ_CHECK(scan.report.broken == scan.pieces.size() - intact);
    FUZZ_CHECK(scan.report.other + payload + head(scan.report) <= content.size());
}

// Frames that are only measured are the same.
void check_measured(const std::string& name, const std::string& content, const Scanned& decoded) {
    const Scanned scan = fuzz_scan(name, content, FP_LENGTH);
    const FileReport &a = scan.report, &b = decoded.report;
    FUZZ_CHECK(a.frames == b.frames && a.broken == b.broken && a.payload == b.payload);
    FUZZ_CHECK(a.other == b.other && a.end_marker == b.end_marker && a.damaged == b.damaged);
    FUZZ_CHECK(scan.pieces.size() == decoded.pieces.size());
    for (size_t i = 0; i < scan.pieces.size(); ++i) {
        const ScannedPiece &c = scan.pieces[i], &d = decoded.pieces[i];
        FUZZ_CHECK(c.offset == d.offset && c.seq_num == d.seq_num && c.len == d.len);
        FUZZ_CHECK(c.type == d.type && c.intact == d.intact && c.kind == d.kind);
    }
}

// Two bytes tell where the chunk is cut, one its kind and one its number.
void check_own_chunk(const uint8_t* data, size_t size) {
    static constexpr uint8_t KINDS[] = {0, 2, 3};  // log, dump, PCM
    if (size < 4) {
        return;
    }
    const std::string body = fuzz_text(data + 4, size - 4);
    const DspChunkHeader header = make_dsp_chunk_header(body.size(), KINDS[data[2] % 3], data[3]);
    const std::string chunk =
        fuzz_text(reinterpret_cast<const uint8_t*>(&header), sizeof(header)) + body;

    const Scanned whole = fuzz_scan("1-agdsp-2016-03-01_09-15-00.log", chunk);
    FUZZ_CHECK(whole.pieces.size() == 1 && !whole.report.damaged && whole.report.other == 0);
    FUZZ_CHECK(whole.pieces[0].data == body && whole.pieces[0].seq_num == data[3]);

    const size_t len = (data[0] | static_cast<size_t>(data[1]) << 8) % chunk.size();
    const Scanned cut = fuzz_scan("1-agdsp-2016-03-01_09-15-00.log", chunk.substr(0, len));
    FUZZ_CHECK(cut.pieces.empty() && cut.report.other == len && cut.report.damaged == (len > 0));
}

// Two bytes tell of each frame how long it is, what stands in it and where. The length in its
// header is what a careless count finds: all bytes between the flags but those that escape.
void check_own_frames(const uint8_t* data, size_t size) {
    static const char* const ODD[] = {"", "}^", "}", "}}", "~", "~~", "}~", "}]}]}]}]"};
    std::string content;
    for (uint32_t i = 0; size > 1 && content.size() < 40000; ++i) {
        const uint8_t kind = data[2 * i % size];
        std::string payload(kind % 2 ? kind % 32 : kind, 'x');
        payload.insert(payload.size() * (data[(2 * i + 1) % size] % 4) / 3, ODD[kind >> 5]);
        DiagHeader header{i, 0, static_cast<uint8_t>(i + 3), 0};
        const auto escapes = static_cast<size_t>(std::count(payload.begin(), payload.end(), '}'));
        header.len = static_cast<uint16_t>(sizeof(header) + payload.size() - escapes);
        uint8_t escaped[2 * sizeof(header)];
        const size_t len = DiagFrameParser::escape(reinterpret_cast<const uint8_t*>(&header),
                                                   sizeof(header), escaped);
        content += "~" + fuzz_text(escaped, len) + payload + "~";
    }
    const std::string name = "0-cp_gnss-2016-03-01_09-15-00.log";
    const Scanned scan = fuzz_scan(name, content);
    check_measured(name, content, scan);
    check_frames(scan, content);
}

}  // namespace

// The first byte tells the name, or is 'c' for a chunk that the service writes, 'f' for many
// frames; from 0x80 on, the content is repeated past the reader's window.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size < 1) {
        return 0;
    }
    if (data[0] == 'c') {
        check_own_chunk(data + 1, size - 1);
        return 0;
    }
    if (data[0] == 'f') {
        check_own_frames(data + 1, size - 1);
        return 0;
    }
    const std::string name = NAMES[(data[0] & 0x7f) % NAME_NUM];
    const std::string text = fuzz_text(data + 1, size - 1);
    std::string content = text;
    while (data[0] >= 0x80 && !text.empty() && content.size() <= LogReader::WINDOW) {
        content += text;
    }
    const Scanned scan = fuzz_scan(name, content);
    check_measured(name, content, scan);
    check_findings(scan.report, content);
    check_record(scan.report, content);
    const bool whole = name == "sha1.txt" || name == "cp_gnss.version" ||
                       name == "cp_wcn_memory_2016-03-01_09-15-00.dmp";
    if (whole || content.empty()) {
        FUZZ_CHECK(scan.pieces.empty());
    } else {
        scan.report.chunked ? check_chunks(scan, content) : check_frames(scan, content);
    }
    return 0;
}
