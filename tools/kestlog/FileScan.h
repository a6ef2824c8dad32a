// SPDX-License-Identifier: Apache-2.0
// The content of one file: its time record, its frames or audio DSP chunks, and its damage.
// A CP's log may hold anything, so bytes outside frames are counted but are not damage. An
// audio DSP log must consist of chunks only.
#ifndef KESTLOG_FILESCAN_H_
#define KESTLOG_FILESCAN_H_

#include <functional>
#include <string>
#include <vector>

#include "channels/DspChunkHeader.h"
#include "channels/TimeSyncRecord.h"
#include "kestlog/FileName.h"
#include "kestlog/LogReader.h"

struct Finding {
    bool damage;  // false: only a note
    const char* code;
    std::string words;
    int64_t offset;  // in the file; -1 without one
};

// A diag frame or a chunk.
struct Piece {
    uint64_t offset;
    size_t size;  // in the file, with its header, flags and escapes
    uint32_t seq_num;
    size_t len_field;  // the length in the header
    uint8_t type;
    uint8_t sub_type;
    const uint8_t* data;    // behind the header; of a frame null unless payload is wanted
    size_t data_len;        // of what is too long for a frame only its beginning
    bool intact;            // that length is right
    const char* kind;       // of a chunk, else null
    bool headless = false;  // too short for a header: all of it is data
};

// Kinds of chunks, as indices.
enum ChunkKind : int { CK_LOG, CK_PCM, CK_DUMP, CK_NUM };
extern const char* const CHUNK_KINDS[CK_NUM];  // their names
// Of a header; negative when it is none of them.
int chunk_kind(const DspChunkHeader& header);
// The wrong field of a chunk's header, or null; stores the length of the chunk's data.
const char* chunk_fault(const DspChunkHeader& header, size_t* data_len);

struct FileReport {
    bool scanned = false;  // for frames or chunks; other files hold none
    bool chunked = false;  // an audio DSP log, else frames or anything
    bool has_record = false;
    TimeSyncRecord record{};
    uint64_t frames = 0;   // intact
    uint64_t broken = 0;   // bytes between flags with another length in their header
    uint64_t payload = 0;  // of intact frames or chunks, without headers
    uint64_t other = 0;    // bytes outside intact frames and chunks
    uint64_t tail = 0;     // where a frame may begin that ends in the next file
    bool end_marker = false;
    struct {
        uint64_t count = 0;
        uint64_t bytes = 0;
    } chunks[CK_NUM];
    uint64_t sequence_gaps = 0;
    // The first MAX_FINDINGS, but gaps in the sequence give way to anything else.
    std::vector<Finding> findings;
    uint64_t more_findings = 0;
    bool more_damage = false;  // among these
    bool damaged = false;

    static constexpr size_t MAX_FINDINGS = 20;
    void add(bool damage, const char* code, const std::string& words, int64_t offset = -1);
    // The findings, and one that tells how many more there were.
    std::vector<Finding> all_findings() const;
};

// The length of the time record in the first bytes of a file, 0 without one. got may be less
// than a record only where the file ends; *cut tells that the record is not whole.
size_t time_record_len(const uint8_t* data, size_t got, const FileName& name, bool* cut);

// Whether the content is chunks: decided by the file's name or, if that says nothing, by the
// first header.
bool is_chunked(LogReader& in, const FileName& name);
// From a chunk that is none to the next valid header, or to the end. The bytes in between.
uint64_t skip_to_chunk(LogReader& in);

// Called for every piece in order; returns false to end the scan. May be null.
typedef std::function<bool(const Piece&)> PieceVisitor;

// What a visitor wants to know of frames; it always gets the data of chunks.
enum FramePayload { FP_LENGTH, FP_DATA };

// Scans the open file. in.error() is set after a read error.
void scan_file(LogReader& in, const FileName& name, const PieceVisitor& visit, FramePayload payload,
               FileReport* report);

#endif  // KESTLOG_FILESCAN_H_
