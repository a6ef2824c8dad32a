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
    m_place = place;
    m_log = &m_logs[place.set->handset];
    m_log->sequence.enter(*place.file->dir);
}

bool DspDumps::take(const Piece& chunk) {
    DspDump& dump = m_log->dump;
    FileReport ignored;
    const int32_t missing = m_log->sequence.take(chunk, &ignored);
    const bool anew = m_log->sequence.anew() || missing < 0;
    const bool of_dump = chunk.kind == CHUNK_KINDS[CK_DUMP];
    // Numbers that go back are those of a new run of the service. What another kind follows
    // behind a gap has ended in the gap.
    if (dump.has_end || anew || (missing > 0 && !of_dump)) {
        finish(&dump);
    }
    if (!of_dump) {
        dump.others += dump.chunks > 0 ? 1 : 0;
        return false;
    }
    if (dump.chunks++ == 0) {
        // The first number of all is 0.
        dump.has_start = anew ? chunk.seq_num == 0 : missing == 0;
    } else {
        dump.missing += static_cast<uint64_t>(missing);
    }
    if (dump.files.empty() || dump.files.back().file != m_place.file) {
        dump.files.push_back(m_place);
    }
    dump.bytes += chunk.data_len;
    dump.has_end = chunk.data_len < DSP_CHUNK_MAX_DATA;
    return true;
}

void DspDumps::finish() {
    for (auto& [handset, log] : m_logs) {
        finish(&log.dump);
    }
}

void DspDumps::finish(DspDump* dump) {
    if (dump->chunks > 0) {
        m_visit(*dump);
    }
    *dump = DspDump();
}
