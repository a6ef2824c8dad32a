// SPDX-License-Identifier: Apache-2.0
// The frame of a log that begins at the end of one file and ends at the head of the next, as the
// service begins a new file anywhere. Owned by whoever goes through the files of logs, in any order
// in which a file comes before the one where its log goes on.
#ifndef KESTLOG_SPLITFRAME_H_
#define KESTLOG_SPLITFRAME_H_

#include <stddef.h>
#include <stdint.h>

#include <string>
#include <unordered_map>

#include "channels/DiagFrameParser.h"
#include "core/open_file.h"
#include "kestlog/FileScan.h"
#include "kestlog/LogTree.h"

class SplitFrame {
public:
    // Whether the bytes of the file from that offset to its size, and what the next file begins
    // with, are an intact frame. Both are opened again for it; links: whether that follows them,
    // as for FILEs that were given. A file is joined once.
    bool join(const TreeFile& file, uint64_t from, uint64_t size, const TreeFile& next,
              Links links);

    // The bytes that the file begins with, behind its time record, which are the end of a frame
    // that was joined. Told once.
    size_t take_head(const TreeFile& file);

    // After a log file was scanned: the frame that begins in it counts in its report and goes to
    // the visitor, if any, as the last one; what ended the frame before does not count as bytes
    // outside frames. next: where the log goes on, or null.
    void end_file(const TreeFile& file, uint64_t size, const TreeFile* next,
                  const PieceVisitor& visit, FileReport* report, Links links = Links::REFUSE);

    // Of the frame, until the next call: its header, and what was decoded, header included.
    const DiagHeader& header() const { return m_header; }
    const uint8_t* body() const { return m_body; }
    size_t len() const { return m_len; }
    uint64_t begin() const { return m_begin; }  // its offset in the first file

private:
    DiagFrameParser m_parser;
    DiagHeader m_header{};
    uint8_t* m_body = nullptr;
    size_t m_len = 0;
    uint64_t m_begin = 0;
    // Of files that are still to come: at most one of each CP of a handset.
    std::unordered_map<const TreeFile*, size_t> m_heads;
};

#endif  // KESTLOG_SPLITFRAME_H_
