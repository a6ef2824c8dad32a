// SPDX-License-Identifier: Apache-2.0

#include "kestlog/DspDumps.h"

#include "channels/DspChunkHeader.h"

std::string DspDump::words() const {
    return is_whole() ? "memory dump" : "part of a memory dump, without " + missing_words();
}

std::string DspDump::missing_words() const {
    std::string words = has_start ? "" : "its start";
    const auto add = [&words](const std::string& what) {
        words += (words.empty() ? "" : ", ") + what;
    };
    if (missing > 0) {
        add(std::to_string(missing) + (missing == 1 ? " chunk" : " chunks"));
    }
    if (!has_end) {
        add("its end");
    }
    return words;
}

void DspDumps::enter(const StreamFile& place) {
    if (!m_place.file || m_place.file->dir->path != place.file->dir->path) {
        finish();
        m_first = true;
    }
    m_place = place;
    m_sequence.enter(*place.file->dir);
}

bool DspDumps::take(const Piece& chunk) {
    FileReport ignored;
    const int32_t missing = m_sequence.take(chunk, &ignored);
    const bool of_dump = chunk.kind == CHUNK_KINDS[CK_DUMP];
    // Numbers that go back are those of a new run of the service. What another kind follows
    // behind a gap has ended in the gap.
    if (m_dump.has_end || missing < 0 || (missing > 0 && !of_dump)) {
        finish();
    }
    // The first number of all is 0.
    const bool follows = m_first || missing < 0 ? chunk.seq_num == 0 : missing == 0;
    m_first = false;
    if (!of_dump) {
        m_dump.others += m_dump.chunks > 0 ? 1 : 0;
        return false;
    }
    if (m_dump.chunks++ == 0) {
        m_dump.has_start = follows;
    } else {
        m_dump.missing += static_cast<uint64_t>(missing);
    }
    if (m_dump.files.empty() || m_dump.files.back().file != m_place.file) {
        m_dump.files.push_back(m_place);
    }
    m_dump.bytes += chunk.data_len;
    m_dump.has_end = chunk.data_len < DSP_CHUNK_MAX_DATA;
    return true;
}

void DspDumps::finish() {
    if (m_dump.chunks > 0) {
        m_visit(m_dump);
    }
    m_dump = DspDump();
}
