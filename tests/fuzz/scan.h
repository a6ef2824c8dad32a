// SPDX-License-Identifier: Apache-2.0
// kestlog's scanner over a text, every piece kept.
#ifndef TESTS_FUZZ_SCAN_H_
#define TESTS_FUZZ_SCAN_H_

#include <string>
#include <vector>

#include "fuzz/fuzz.h"
#include "kestlog/FileScan.h"

struct ScannedPiece {
    uint64_t offset;
    uint32_t seq_num;
    bool intact;
    std::string kind;  // of a chunk
    std::string data;
};

struct Scanned {
    FileReport report;
    std::vector<ScannedPiece> pieces;
};

// The scan of a file of that name and content.
inline Scanned fuzz_scan(const std::string& name, const std::string& content) {
    static const FuzzFile file;
    file.write(content);
    Scanned result;
    LogReader in;
    FUZZ_CHECK(in.open(file.path, true));
    scan_file(
        in, FileName(name),
        [&](const Piece& piece) {
            result.pieces.push_back(
                {piece.offset, piece.seq_num, piece.intact, piece.kind ? piece.kind : "",
                 piece.data_len > 0 ? fuzz_text(piece.data, piece.data_len) : std::string()});
            return true;
        },
        &result.report);
    FUZZ_CHECK(in.error() == 0);
    return result;
}

#endif  // TESTS_FUZZ_SCAN_H_
