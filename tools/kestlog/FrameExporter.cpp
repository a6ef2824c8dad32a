// SPDX-License-Identifier: Apache-2.0

#include "kestlog/FrameExporter.h"

#include <errno.h>
#include <string.h>

#include <algorithm>

#include "channels/DspChunkHeader.h"
#include "channels/modem_dump_end.h"
#include "common/text.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/Report.h"
#include "kestlog/TreeInput.h"

namespace {

constexpr size_t MAX_REMARKS = 2000;

}  // namespace

int FrameExporter::add(const ExportSource& source) {
    const std::string shown = source.file->shown();
    LogReader in;
    FileReport report;
    m_source = &source;
    m_report = &report;
    m_begun = m_any = m_named = false;
    if (!in.open(source.file->path(), source.set->given)) {
        const int error = errno;
        lost(error);
        return failure(ES_UNREADABLE, shown + ": " + strerror(error));
    }
    ++m_totals.files;
    const PieceVisitor visit = [this](const Piece& piece) { return take(piece); };
    scan_file(in, source.file->name, visit, FP_DATA, &report);
    if (m_writer.good()) {
        end(in);
        if (in.error()) {
            lost(in.error());
        }
    }
    tell_damage(shown, report);
    const int status = scan_status(in, shown, report);
    if (status == ES_OK && source.set->given && !source.file->name.exact && !report.chunked &&
        report.frames == 0 && !(m_wanted.broken && report.broken > 0)) {
        return failure(ES_UNREADABLE, shown + ": no frames or chunks in it");
    }
    return status;
}

// Before the first piece, or at the end of a file without one.
void FrameExporter::begin() {
    const LogTime& named = m_source->file->name.time();
    m_begun = true;
    m_time = has_time(named) ? seconds_of(named) : 0;
    m_end = 0;
    if (m_report->has_record) {
        m_time = m_report->record.seconds;
        m_end = sizeof(TimeSyncRecord);
    }
    m_end += m_split.take_head(*m_source->file);
    m_tail = m_end;
}

void FrameExporter::lost(int error) {
    remark_next(file_name() + " could not be read: " + strerror(error));
}

bool FrameExporter::take(const Piece& piece) {
    if (!m_begun) {
        begin();
    }
    m_tail = piece.offset + piece.size - (piece.intact ? 0 : 1);
    if (!piece.intact && (!m_wanted.broken || (piece.headless && m_wanted.type >= 0))) {
        return true;  // it counts with the bytes before the next one
    }
    const size_t head = piece.headless ? 0 : piece.kind ? DSP_CHUNK_HEADER_LEN : sizeof(DiagHeader);
    const uint8_t* const body = piece.data - head;
    const size_t len = head + piece.data_len;
    if (piece.offset > m_end) {
        remark_next(outside(piece.offset - m_end, "before this packet"));
    }
    m_end = piece.offset + piece.size;
    if (!write(m_time, piece.type, body, len)) {
        return m_writer.good();
    }
    if (!m_named) {
        m_named = true;
        const char* const source = m_report->has_record                    ? "time of its record"
                                   : has_time(m_source->file->name.time()) ? "time of its name"
                                                                           : "time unknown";
        m_writer.comment(escape_text(file_name()) + ": " + source);
    }
    if (!piece.intact) {
        ++m_totals.broken;
        m_writer.comment(piece.headless
                             ? "broken: too short for a header"
                             : "broken: its header says " + std::to_string(piece.len_field) +
                                   " bytes, there are " + std::to_string(len));
    }
    if (m_source->file->name.framed_dump && piece.data_len == MODEM_DUMP_END_LEN &&
        memcmp(piece.data, MODEM_DUMP_END, MODEM_DUMP_END_LEN) == 0) {
        m_writer.comment("end of the memory dump");
    }
    return true;
}

// After the last piece.
void FrameExporter::end(const LogReader& in) {
    const TreeFile& file = *m_source->file;
    if (!m_begun) {
        begin();
    }
    uint64_t left = in.size() - std::min(in.size(), m_end);
    const Links links = m_source->set->given ? Links::FOLLOW : Links::REFUSE;
    if (left > 0 && m_source->next && !m_report->chunked &&
        m_split.join(file, m_tail, in.size(), *m_source->next, links)) {
        const uint64_t skipped = m_split.begin() - std::min(m_split.begin(), m_end);
        if (skipped > 0) {
            remark_next(outside(skipped, "before this packet"));
        }
        if (write(m_time, m_split.header().type, m_split.body(), m_split.len())) {
            m_writer.comment(escape_text("begins in " + file.name.text() + ", ends in " +
                                         m_source->next->name.text()));
        }
        left = 0;
    }
    if (left > 0) {
        remark_last(outside(left, "at the end of " + file.name.text()));
    }
    if (file.name.framed_dump && !m_report->end_marker) {
        remark_last("the memory dump ends without its end marker");
    }
    if (file.missing > 0) {
        remark_last("log files are missing after " + file.name.text() + ": " + missing_text(file));
    }
}

// False when it was left out or could not be written.
bool FrameExporter::write(int64_t time, uint8_t type, const uint8_t* data, size_t len) {
    if (m_wanted.type >= 0 && m_wanted.type != type) {
        return false;
    }
    m_writer.add_packet(m_source->interface, m_source->queue, time, data, len);
    if (!remarks().empty()) {
        m_writer.comment(remarks());
        remarks().clear();
    }
    m_any = true;
    ++m_totals.packets;
    return m_writer.good();
}

// Counts bytes that are in no packet; the words for them.
std::string FrameExporter::outside(uint64_t bytes, const std::string& where) {
    m_totals.other += bytes;
    return std::to_string(bytes) + (bytes == 1 ? " byte " : " bytes ") + where + " " +
           (bytes == 1 ? "is" : "are") + " in no intact " + (m_report->chunked ? "chunk" : "frame");
}

void FrameExporter::remark_next(const std::string& text) {
    if (remarks().size() < MAX_REMARKS) {
        remarks() += (remarks().empty() ? "" : "; ") + escape_text(text);
    }
}

void FrameExporter::remark_last(const std::string& text) {
    if (m_any) {
        m_writer.comment(escape_text(text));
    } else {
        remark_next(text);
    }
}
