// SPDX-License-Identifier: Apache-2.0
// kestlog's scanner of a log file: every byte is accounted for, and every piece is what stands
// at its place.
#include <string.h>

#include "fuzz/scan.h"

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
        FUZZ_CHECK(piece.intact && piece.offset >= end);
        FUZZ_CHECK(content.compare(piece.offset, 4, "~~~~") == 0);
        FUZZ_CHECK(content.compare(piece.offset + 20, piece.data.size(), piece.data) == 0);
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
        FUZZ_CHECK(piece.offset >= start && piece.offset < content.size());
        FUZZ_CHECK(content[piece.offset] == '~' || escapes);
        start = piece.offset + 1;
        intact += piece.intact;
        payload += piece.intact ? piece.data.size() : 0;
        if (piece.intact && !escapes) {
            FUZZ_CHECK(content.compare(piece.offset + 9, piece.data.size() + 1, piece.data + "~") ==
                       0);
        }
    }
    FUZZ_CHECK(scan.report.frames == intact && scan.report.payload == payload);
    FUZZ_CHECK(scan.report.broken == scan.pieces.size() - intact);
    FUZZ_CHECK(scan.report.other + payload + head(scan.report) <= content.size());
}

}  // namespace

// The first byte tells the name; from 0x80 on, the content is repeated past the reader's
// window.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size < 1) {
        return 0;
    }
    const std::string name = NAMES[(data[0] & 0x7f) % NAME_NUM];
    const std::string text = fuzz_text(data + 1, size - 1);
    std::string content = text;
    while (data[0] >= 0x80 && !text.empty() && content.size() <= LogReader::WINDOW) {
        content += text;
    }
    const Scanned scan = fuzz_scan(name, content);
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
