// SPDX-License-Identifier: Apache-2.0
// What each file of the tree adds to the report.
#include "kestlog/CardReport.h"

#include <algorithm>

#include "channels/ModemImage.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/Spectrum.h"
#include "kestlog/TreeInput.h"
#include "kestlog/small_files.h"

namespace {

// Logs that pause for longer are shown as a gap. Files follow each other at once where the stream
// went on; their times have a resolution of a second.
constexpr int64_t PAUSE_SECONDS = 2;

// 0 also where the clock was set in between.
int64_t seconds_between(const LogTime& from, const LogTime& to) {
    return has_time(from) && has_time(to) && clock_was_set(from) == clock_was_set(to)
               ? seconds_of(to) - seconds_of(from)
               : 0;
}

std::string base64(const std::vector<uint8_t>& bytes) {
    static const char DIGITS[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    std::string text;
    for (size_t i = 0; i < bytes.size(); i += 3) {
        uint32_t bits = 0;
        const size_t n = std::min<size_t>(3, bytes.size() - i);
        for (size_t k = 0; k < 3; ++k) {
            bits = bits << 8 | (k < n ? bytes[i + k] : 0u);
        }
        for (size_t k = 0; k < 4; ++k) {
            text += k <= n ? DIGITS[bits >> (18 - 6 * k) & 63] : '=';
        }
    }
    return text;
}

// Whether it is known how long the log file lasts: not where only its start is known, what came
// behind it is missing, or the clock was set meanwhile.
bool length_is_known(const FilePlace& place) {
    const TreeFile& log = *place.file;
    const LogTime start = log.name.time(), end = log.end.time();
    const bool newest = log.first_missing() == 0;
    return clock_was_set(start) == clock_was_set(end) && !log.disordered &&
           ((!newest && !log.missing) ||
            (place.cp->own_times && !(local_time(log.modified) < start)));
}

size_t count_cps(const LogTree& tree) {
    std::set<std::string> names;
    for (const TreeSet& set : tree.sets) {
        for (const TreeCp& cp : set.cps) {
            names.insert(cp.name);
        }
    }
    return names.size();
}

}  // namespace

CardReport::CardReport(const LogTree& tree, const ReportOptions& options)
    : m_tree(tree), m_options(options), m_timeline(count_cps(tree)) {
    // In the order in which they are printed.
    for (const char* value : {"version", "roots", "from", "to", "totals", "most_merged"}) {
        m_json[value] = nullptr;
    }
    for (const char* list : {"sets", "cps", "timeline", "crashes", "versions", "databases",
                             "findings", "unreadable", "spectra", "waveforms"}) {
        m_json[list] = Json::array();
    }
    for (const TreeSet& set : tree.sets) {
        for (const TreeCp& cp : set.cps) {
            m_cps[cp.name];
        }
    }
    check_tree(tree, *this);
    add_crashes();
    write_totals();
}

PieceVisitor CardReport::begin(const FilePlace& place) {
    ++m_files;
    m_size += place.file->size;
    m_file_damages = 0;
    m_place = place;
    if (!place.cp || !place.file->name.is_log()) {
        return nullptr;
    }
    CpSum* const cp = &m_cps[place.cp->name];
    const bool of_dsp = place.file->name.cp_type == CT_AGDSP;
    const bool timed = length_is_known(place);
    if (of_dsp) {
        m_dsp_dumps.enter({place.set, place.cp, place.file});
    }
    return [this, cp, of_dsp, timed](const Piece& piece) {
        if (!piece.intact) {
            return true;
        }
        TypeSum& sum = cp->types[piece.type * 256 + piece.sub_type];
        ++sum.count;
        sum.bytes += piece.data_len;
        sum.timed_bytes += timed ? piece.data_len : 0;
        if (piece.kind && of_dsp) {
            m_dsp_dumps.take(piece);
            if (m_options.pcm) {
                add_pcm(piece);
            }
        }
        return true;
    };
}

// The files of a CP in a set come one after the other.
void CardReport::add_pcm(const Piece& piece) {
    const bool begun = !m_waveforms.empty() && m_waveforms.back().first.cp == m_place.cp;
    if (begun && piece.seq_num != m_next_seq) {
        m_waveforms.back().second.restart();
    }
    m_next_seq = piece.seq_num + 1;
    if (piece.kind != CHUNK_KINDS[CK_PCM] || piece.data_len == 0) {
        return;
    }
    if (!begun && m_waveforms.size() == MAX_PICTURES) {
        if (m_no_waveform != m_place.cp) {
            add_row("waveforms", 0, nullptr);  // counts it
        }
        m_no_waveform = m_place.cp;
        return;
    }
    if (!begun) {
        m_waveforms.push_back({m_place, Waveform(*m_options.pcm, m_options.pcm_channels)});
    }
    m_waveforms.back().second.add(piece.data, piece.data_len);
}

// When the file was written to last or, when nothing tells that, when the next one began. Where
// that is missing only its own start is known.
LogTime CardReport::last_byte(const FilePlace& place) {
    const TreeFile& log = *place.file;
    const LogTime& start = log.name.time();
    const LogTime written = place.cp->own_times ? local_time(log.modified)
                            : log.missing       ? start
                                                : log.end.time();
    LogTime end = written < start || log.end.time() < written ? log.end.time() : written;
    // A set ends where the handset's next begins. It may lie behind very many of other handsets,
    // and so is looked for only where it matters.
    if (log.name.number == 0) {
        const auto later = std::upper_bound(
            m_tree.sets.begin(), m_tree.sets.end(), start,
            [](const LogTime& time, const TreeSet& set) { return time < set.time; });
        const auto next = std::find_if(later, m_tree.sets.end(), [&place](const TreeSet& set) {
            return set.handset == place.set->handset;
        });
        end = next != m_tree.sets.end() ? std::min(end, next->time) : end;
    }
    return clock_was_set(start) == clock_was_set(end) ? end : start;
}

void CardReport::find(const std::string& path, const Finding& finding) {
    ++(finding.damage ? m_damages : m_notes);
    m_file_damages += finding.damage ? 1 : 0;
    if (m_place.cp) {
        CpSum& cp = m_cps[m_place.cp->name];
        ++(finding.damage ? cp.damages : cp.notes);
    }
    Json row = finding_json(finding);
    row["path"] = json_text(path);
    add_row("findings", MAX_ROWS, row);
}

void CardReport::unreadable(const std::string& words) {
    ++m_unreadable;
    failure(ES_UNREADABLE, words);
    add_row("unreadable", MAX_ROWS, json_text(words));
}

void CardReport::end(const FilePlace& place, const FileReport& report) {
    const TreeFile& file = *place.file;
    if (!place.cp) {
        add_database(file);
        m_place = {};
        return;
    }
    CpSum& cp = m_cps[place.cp->name];
    SetSum& set = sum_of(*place.set);
    ++cp.files;
    cp.size += file.size;
    ++set.files;
    set.size += file.size;
    set.damages += m_file_damages;
    if (has_time(file.name.time())) {
        take_earlier(&set.from, file.name.time());
        set.to = std::max(set.to, file.name.is_log() ? last_byte(place) : file.name.time());
    }
    const LogType type = file.name.type;
    if (type == LT_LOG) {
        add_log(place, report, &cp);
    } else if (type == LT_VERSION) {
        add_version(place);
    } else if (type == LT_RINGBUF || type == LT_SLEEP_LOG || type == LT_WCDMA_IQ) {
        TimelineItem item;
        item.from = item.to = file.name.time();
        item.files = 1;
        item.size = file.size;
        item.damages = m_file_damages;
        item.set = place.set;
        item.name = file.name.text();
        m_timeline.add(place.cp->name, file.name.kind(), item);
    }
    if (m_file_damages && (of_crash(file) || report.chunks[CK_DUMP].count > 0)) {
        m_damaged[&file] = m_file_damages;
    }
    if (type == LT_WCDMA_IQ && m_options.iq) {
        add_spectrum(place);
    }
    m_place = {};
}

void CardReport::add_log(const FilePlace& place, const FileReport& report, CpSum* cp) {
    const TreeFile& log = *place.file;
    TimelineItem item;
    item.from = log.name.time();
    item.to = last_byte(place);
    item.files = 1;
    item.size = log.size;
    item.seconds = static_cast<uint64_t>(std::max<int64_t>(0, seconds_between(item.from, item.to)));
    item.timed_size = length_is_known(place) ? log.size : 0;
    item.damages = m_file_damages;
    item.sequence_gaps = report.sequence_gaps;
    item.set = place.set;
    item.name = log.name.text();
    m_timeline.add(place.cp->name, TK_LOG, item);
    add_gaps(place, item.to);

    ++cp->logs;
    cp->log_size += log.size;
    cp->timed_size += item.timed_size;
    cp->seconds += item.seconds;
    cp->frames += report.frames;
    for (const auto& chunks : report.chunks) {
        cp->chunks += chunks.count;
    }
    cp->broken += report.broken;
    cp->payload += report.payload;
    cp->other += report.other;
    cp->sequence_gaps += report.sequence_gaps;
    cp->missing += log.missing;
}

void CardReport::add_gaps(const FilePlace& place, const LogTime& to) {
    Last& last = last_of(place);
    const TreeFile& log = *place.file;
    TimelineItem gap;
    gap.set = place.set;
    LogTime first = log.name.time();
    if (m_options.whole && last.set != place.set && !place.set->name.empty() &&
        seconds_between(place.set->time, first) > PAUSE_SECONDS) {
        gap.from = place.set->time;
        gap.to = first;
        gap.words = "no log from the start of the set: trimmed, or the CP began later";
        m_timeline.add(place.cp->name, TK_TRIMMED, gap);
        first = place.set->time;
    }
    if (last.known && seconds_between(last.byte, first) > PAUSE_SECONDS) {
        gap.from = last.byte;
        gap.to = first;
        gap.words = "no log: the CP was silent or off, or the quota deleted files";
        m_timeline.add(place.cp->name, TK_SILENCE, gap);
    }
    if (log.missing) {
        gap.from = to;
        gap.to = log.end.time();
        gap.words = missing_text(log);
        m_timeline.add(place.cp->name, TK_MISSING, gap);
    }
    const LogTime end = log.missing ? log.end.time() : to;
    last.known = length_is_known(place) && (last.known || !(end < last.byte));
    last.set = place.set;
    last.byte = std::max(last.byte, end);
}

void CardReport::add_version(const FilePlace& place) {
    Last& last = last_of(place);
    int ignored;  // the check has told it
    const std::string version = read_version(place.file->path(), &ignored);
    const bool changed = !last.version.empty() && last.version != version;
    if (changed) {
        TimelineItem item;
        item.from = item.to = place.set->time;
        item.set = place.set;
        item.words = last.version + " -> " + version;
        m_timeline.add(place.cp->name, TK_FIRMWARE, item);
    }
    last.version = version;
    add_row("versions", MAX_ROWS,
            {{"cp", json_text(place.cp->name)},
             {"set", json_text(place.set->name)},
             {"medium", json_text(place.set->medium())},
             {"version", json_text(version)},
             {"changed", changed}});
}

void CardReport::add_database(const TreeFile& file) {
    Json row = {{"path", json_text(file.shown())}, {"size", file.size}};
    if (file.name.text() == DIGEST_NAME) {
        int ignored;
        row["digest"] = json_text(read_small(file.path(), SHA1_HEX_LEN, &ignored));
    }
    add_row("databases", MAX_ROWS, row);
}

void CardReport::add_spectrum(const FilePlace& place) {
    LogReader in;
    if (m_json["spectra"].size() >= MAX_PICTURES) {
        add_row("spectra", 0, nullptr);  // counts it
        return;
    }
    if (!in.open(place.file->path(), false)) {
        return;  // the check has told why
    }
    const Spectrum spectrum = spectrum_of(in, *m_options.iq);
    if (in.error()) {
        unreadable(place.file->shown() + ": read error");
    }
    add_row("spectra", MAX_PICTURES,
            {{"cp", json_text(place.cp->name)},
             {"name", json_text(place.file->name.text())},
             {"time", time_text(place.file->name.time())},
             {"format", m_options.iq->iq},
             {"rate", m_options.iq_rate},
             {"samples", spectrum.samples},
             {"columns", spectrum.columns},
             {"bins", Spectrum::BINS},
             {"lowest_db", Spectrum::LOWEST_DB},
             {"levels", base64(spectrum.levels)}});
}

void CardReport::add_crashes() {
    m_dsp_dumps.finish();
    for (; m_more_dsp_crashes > 0; --m_more_dsp_crashes) {
        add_row("crashes", 0, nullptr);  // counts it
    }
    for (const Crash& crash : find_crashes(m_tree, std::move(m_dsp_crashes))) {
        TimelineItem item;
        Json files = Json::array();
        item.from = crash.time;
        item.set = crash.set;
        item.name = crash.files[0]->name.text();
        item.words = crash_text(crash);
        for (const TreeFile* file : crash.files) {
            ++item.files;
            item.size += file->size;
            item.to = file->name.time();
            const auto damaged = m_damaged.find(file);
            item.damages += damaged == m_damaged.end() ? 0 : damaged->second;
            files.push_back(json_text(file->name.text()));
        }
        item.size = crash.dump.empty() ? item.size : crash.dump_size;
        m_timeline.add(crash.cp->name, TK_CRASH, item);
        add_row("crashes", MAX_ROWS,
                {{"cp", json_text(crash.cp->name)},
                 {"set", json_text(crash.set->name)},
                 {"medium", json_text(crash.set->medium())},
                 {"time", time_text(crash.time)},
                 {"what", json_text(item.words)},
                 {"size", item.size},
                 {"damages", item.damages},
                 {"files", files}});
    }
}

void CardReport::add_row(const char* list, size_t max, const Json& row) {
    Json& rows = m_json[list];
    if (rows.size() < max) {
        rows.push_back(row);
    } else {
        Json& more = m_json[std::string("more_") + list];
        more = more.is_null() ? 1 : more.get<uint64_t>() + 1;
    }
}
