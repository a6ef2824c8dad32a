// SPDX-License-Identifier: Apache-2.0

#include "kestlog/FileScan.h"

#include <cutils/properties.h>
#include <stdlib.h>
#include <string.h>

#include <algorithm>

#include "channels/DiagFrameParser.h"
#include "channels/ModemImage.h"
#include "channels/modem_dump_end.h"
#include "core/text.h"
#include "kestlog/measure_frame.h"

const char* const CHUNK_KINDS[CK_NUM] = {"log", "pcm", "dump"};

int chunk_kind(const DspChunkHeader& header) {
    static const uint8_t TYPES[CK_NUM] = {DSP_CHUNK_LOG, DSP_CHUNK_PCM, DSP_CHUNK_DUMP};
    for (int i = 0; i < CK_NUM; ++i) {
        if (header.sub_type == (TYPES[i] | DSP_CHUNK_SUB_TYPE)) {
            return i;
        }
    }
    return -1;
}

const char* chunk_fault(const DspChunkHeader& header, size_t* data_len) {
    const uint16_t least = make_dsp_chunk_header(0, 0, 0).len;
    *data_len = header.len >= least ? static_cast<size_t>(header.len - least) : 0;
    const DspChunkHeader good = make_dsp_chunk_header(*data_len, 0, 0);
    if (memcmp(header.flags, good.flags, sizeof(good.flags)) != 0) {
        return "flags";
    }
    if (header.mark != good.mark) {
        return "mark";
    }
    if (header.len < least) {
        return "length";
    }
    if (header.checksum != good.checksum) {
        return "checksum";
    }
    if (header.reserved != good.reserved) {
        return "reserved field";
    }
    if (header.diag_len != good.diag_len) {
        return "second length";
    }
    return header.type != good.type || chunk_kind(header) < 0 ? "type" : nullptr;
}

namespace {

// A dump whose last write is more recent than this may still be in progress.
constexpr time_t DUMP_IDLE_SECONDS = 10;

bool begins_with_magic(const uint8_t* data, size_t len) {
    const uint32_t magic = TIME_SYNC_MAGIC;
    return len > 0 && memcmp(data, &magic, std::min(len, sizeof(magic))) == 0;
}

// A modem's log should begin with a time record, and any log may.
bool record_due(const FileName& name) {
    return name.is_log() && name.of_modem();
}

class Scanner {
public:
    Scanner(LogReader& in, const FileName& name, const PieceVisitor& visit, FramePayload payload,
            FileReport* report)
        : m_in(in), m_name(name), m_visit(visit), m_payload(payload), m_report(*report) {}

    void run() {
        size_t got;
        m_in.peek(1, got);
        if (got == 0) {
            m_report.add(false, "empty", "the file is empty");
        }
        const bool raw = strcmp(m_name.kind(), "memory copy") == 0 || m_name.type == LT_MINI_DUMP ||
                         m_name.type == LT_IPC_INFO || m_name.type == LT_WCDMA_IQ ||
                         m_name.text() == DATABASE_NAME ||
                         (m_name.type == LT_DUMP && !m_name.framed_dump);
        m_report.chunked = is_chunked(m_in, m_name);
        m_report.scanned = !raw && m_name.type != LT_VERSION && m_name.text() != DIGEST_NAME;
        if (got == 0 || raw) {
            return;
        }
        if (m_name.type == LT_VERSION) {
            check_version();
        } else if (m_name.text() == DIGEST_NAME) {
            check_digest();
        } else {
            take_record();
            m_report.chunked ? scan_chunks() : scan_frames();
        }
    }

private:
    int64_t here() const { return static_cast<int64_t>(m_in.offset()); }

    void check_version() {
        size_t got;
        m_in.peek(PROPERTY_VALUE_MAX, got);
        if (got >= PROPERTY_VALUE_MAX) {
            m_report.add(true, "version", "the version record is too long");
        }
    }

    void check_digest() {
        size_t got;
        const uint8_t* data = m_in.peek(SHA1_HEX_LEN + 1, got);
        if (got != SHA1_HEX_LEN || !std::all_of(data, data + got, [](uint8_t c) {
                return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'F');
            })) {
            m_report.add(true, "digest",
                         "not " + std::to_string(SHA1_HEX_LEN) + " upper-case hexadecimal digits");
        }
    }

    void take_record() {
        size_t got;
        const uint8_t* data = m_in.peek(sizeof(TimeSyncRecord), got);
        bool cut;
        const size_t len = time_record_len(data, got, m_name, &cut);
        if (len == 0) {
            if (record_due(m_name)) {
                m_report.add(false, "record", "no time record at the start");
            }
            return;
        }
        if (cut) {
            m_report.add(true, "record", "the time record is cut off", here());
            m_report.other += len;
        } else {
            m_report.has_record = true;
            memcpy(&m_report.record, data, sizeof(TimeSyncRecord));
        }
        m_in.skip(len);
    }

    void scan_frames() {
        uint64_t first_broken = 0;
        uint64_t framed = 0;
        const uint64_t start = m_in.offset();
        m_report.tail = start;
        bool between = true;  // frames: the parser holds nothing
        for (size_t got; !m_stop;) {
            const uint8_t* data = m_in.peek(1, got);
            if (got == 0) {
                break;
            }
            size_t used = between && m_payload == FP_LENGTH ? measure_frames(data, got) : 0;
            if (used > 0) {
                framed += used;
                m_in.skip(used);
                m_report.tail = m_in.offset();
                continue;
            }
            uint8_t* body;
            size_t len;
            between = m_parser.unescape(data, got, body, len, used);
            if (!between) {
                m_in.skip(used);
                m_report.tail = m_in.offset() - m_parser.pending();
                continue;
            }
            const uint64_t end = m_in.offset() + used;
            const size_t size = m_parser.raw_size();
            if (take_frame(end > size ? end - size : 0, size, body, len)) {
                framed += size;
            } else {
                first_broken = m_report.broken++ ? first_broken : end - size;
                // The flag that ended these bytes may begin a frame.
                m_parser.init();
                --used;
            }
            m_in.skip(used);
            m_report.tail = m_in.offset();
        }
        const uint64_t all = m_in.offset() - start;
        m_report.other += all - std::min(all, framed);
        if (!m_name.framed_dump || m_stop) {
            return;
        }
        if (m_report.broken) {
            m_report.add(true, "frame",
                         std::to_string(m_report.broken) + " frames with a wrong length",
                         static_cast<int64_t>(first_broken));
        } else if (m_report.other) {
            m_report.add(false, "frame",
                         std::to_string(m_report.other) + " bytes are outside frames");
        }
        if (!m_report.end_marker) {
            const bool recent = std::abs(time(nullptr) - m_in.modified()) < DUMP_IDLE_SECONDS;
            m_report.add(!recent, "end",
                         recent ? "dump still in progress" : "the dump has no end marker");
        }
    }

    // Takes the intact frames that these bytes begin with; the bytes used.
    size_t measure_frames(const uint8_t* data, size_t len) {
        size_t used = 0;
        DiagHeader header;
        Piece piece{};
        piece.intact = true;
        for (size_t body_len = 0; !m_stop;) {
            const size_t size = measure_frame(data + used, len - used, header, body_len);
            const bool end = m_name.framed_dump && is_end_len(body_len);
            if (size == 0 || header.len != body_len || end) {
                break;  // to be decoded
            }
            piece.offset = m_in.offset() + used;
            piece.size = size;
            piece.data_len = body_len - sizeof(header);
            visit_frame(header, &piece);
            used += size;
        }
        return used;
    }

    static bool is_end_len(size_t body_len) {
        return body_len == sizeof(DiagHeader) + MODEM_DUMP_END_LEN;
    }

    // True for an intact frame.
    bool take_frame(uint64_t offset, size_t size, const uint8_t* body, size_t len) {
        DiagHeader header{};
        Piece piece{};
        piece.offset = offset;
        piece.size = size;
        if (len >= sizeof(header)) {
            memcpy(&header, body, sizeof(header));
            piece.data = body + sizeof(header);
            piece.data_len = len - sizeof(header);
            const bool end = m_name.framed_dump && is_end_len(len) &&
                             memcmp(piece.data, MODEM_DUMP_END, MODEM_DUMP_END_LEN) == 0;
            m_report.end_marker |= end;
            piece.intact = header.len == len || end;
        } else {
            piece.data = body;
            piece.data_len = len;
            piece.headless = true;
        }
        visit_frame(header, &piece);
        return piece.intact;
    }

    // Sets what the header says of the piece.
    void visit_frame(const DiagHeader& header, Piece* piece) {
        if (piece->intact) {
            ++m_report.frames;
            m_report.payload += piece->data_len;
        }
        if (m_visit) {
            piece->seq_num = header.seq_num;
            piece->len_field = header.len;
            piece->type = header.type;
            piece->sub_type = header.sub_type;
            m_stop = !m_visit(*piece);
        }
    }

    void scan_chunks() {
        bool follows = false;
        uint32_t next_seq = 0;
        for (DspChunkHeader header; !m_stop;) {
            size_t got;
            size_t len;
            const uint8_t* data = m_in.peek(sizeof(header), got);
            if (got == 0) {
                return;
            }
            memset(header.flags, DSP_CHUNK_FLAG, sizeof(header.flags));
            if (got < sizeof(header)) {
                if (memcmp(data, header.flags, std::min(got, sizeof(header.flags))) == 0) {
                    cut_off(got);
                } else {
                    m_report.add(true, "chunk", "data after the last chunk is not a chunk", here());
                    m_report.other += got;
                }
                return;
            }
            memcpy(&header, data, sizeof(header));
            if (const char* fault = chunk_fault(header, &len)) {
                m_report.add(true, "chunk", std::string("wrong chunk header: ") + fault, here());
                m_report.other += skip_to_chunk(m_in);
                continue;
            }
            data = m_in.peek(sizeof(header) + len, got);
            if (got < sizeof(header) + len) {
                return cut_off(got);
            }
            if (follows && header.seq_num != next_seq) {
                ++m_report.sequence_gaps;
                m_report.add(false, "sequence",
                             "chunk " + std::to_string(header.seq_num) + " where " +
                                 std::to_string(next_seq) + " was expected",
                             here());
            }
            follows = true;
            next_seq = header.seq_num + 1;
            take_chunk(header, data + sizeof(header), len);
            m_in.skip(sizeof(header) + len);
        }
    }

    void take_chunk(const DspChunkHeader& header, const uint8_t* data, size_t len) {
        const int kind = chunk_kind(header);
        ++m_report.chunks[kind].count;
        m_report.chunks[kind].bytes += len;
        m_report.payload += len;
        m_stop = m_visit &&
                 !m_visit({m_in.offset(), sizeof(header) + len, header.seq_num, header.diag_len,
                           header.type, header.sub_type, data, len, true, CHUNK_KINDS[kind]});
    }

    // The newest file of a CP may still be written to.
    void cut_off(size_t left) {
        const bool newest = m_name.is_log() && m_name.number == 0;
        m_report.add(!newest, "cut",
                     newest ? "the last chunk is unfinished" : "the last chunk is cut off", here());
        m_report.other += left;
    }

    LogReader& m_in;
    const FileName& m_name;
    const PieceVisitor& m_visit;
    const FramePayload m_payload;
    FileReport& m_report;
    bool m_stop = false;
    // What is too long for a frame is broken, too.
    DiagFrameParser m_parser{DiagFrameParser::Overlong::CUT};
};

}  // namespace

void FileReport::add(bool damage, const char* code, const std::string& words, int64_t offset) {
    const auto is_gap = [](const Finding& finding) {
        return strcmp(finding.code, "sequence") == 0;
    };
    const Finding added = {damage, code, words, offset};
    damaged |= damage;
    if (findings.size() == MAX_FINDINGS) {
        ++more_findings;
        // Any number of gaps must not hide damage, or what is damage once the file is closed.
        const auto gap = std::find_if(findings.rbegin(), findings.rend(), is_gap);
        if (is_gap(added) || gap == findings.rend()) {
            more_damage |= damage;
            return;
        }
        findings.erase(std::next(gap).base());
    }
    findings.push_back(added);
}

std::vector<Finding> FileReport::all_findings() const {
    std::vector<Finding> all = findings;
    if (more_findings) {
        all.push_back({more_damage, "more", std::to_string(more_findings) + " more findings", -1});
    }
    return all;
}

size_t time_record_len(const uint8_t* data, size_t got, const FileName& name, bool* cut) {
    const size_t len = std::min(got, sizeof(TimeSyncRecord));
    *cut = len < sizeof(TimeSyncRecord);
    return name.type != LT_DUMP && begins_with_magic(data, len) && (!*cut || record_due(name)) ? len
                                                                                               : 0;
}

bool is_chunked(LogReader& in, const FileName& name) {
    if (name.exact) {
        return name.is_log() && name.cp_type == CT_AGDSP;
    }
    DspChunkHeader header;
    size_t got;
    size_t len;
    const uint8_t* data = in.peek(sizeof(TimeSyncRecord) + sizeof(header), got);
    const size_t record = begins_with_magic(data, got) ? sizeof(TimeSyncRecord) : 0;
    if (got < record + sizeof(header)) {
        return false;
    }
    memcpy(&header, data + record, sizeof(header));
    return !chunk_fault(header, &len);
}

uint64_t skip_to_chunk(LogReader& in) {
    DspChunkHeader header;
    size_t len;
    uint8_t flags[sizeof(header.flags)];
    memset(flags, DSP_CHUNK_FLAG, sizeof(flags));
    const uint64_t from = in.offset();
    for (size_t pass = 1;;) {
        in.skip(pass);
        size_t got;
        const uint8_t* data = in.peek(sizeof(header), got);
        if (got < sizeof(header)) {
            in.skip(got);
            return in.offset() - from;
        }
        memcpy(&header, data, sizeof(header));
        if (!chunk_fault(header, &len)) {
            return in.offset() - from;
        }
        const uint8_t* next = find_bytes(data + 1, got - 1, flags, sizeof(flags));
        pass = next ? static_cast<size_t>(next - data) : got - (sizeof(flags) - 1);
    }
}

void scan_file(LogReader& in, const FileName& name, const PieceVisitor& visit, FramePayload payload,
               FileReport* report) {
    Scanner(in, name, visit, payload, report).run();
}
