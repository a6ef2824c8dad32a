// SPDX-License-Identifier: Apache-2.0
// Everything that a report tells about a tree, as one JSON object of limited size: what
// "kestlog report --json" prints and what the page shows.
#ifndef KESTLOG_CARDREPORT_H_
#define KESTLOG_CARDREPORT_H_

#include <nlohmann/json.hpp>

#include <algorithm>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "kestlog/Crashes.h"
#include "kestlog/SampleFormat.h"
#include "kestlog/Timeline.h"
#include "kestlog/TreeCheck.h"
#include "kestlog/Waveform.h"

struct ReportOptions {
    // Null or 0: no spectrum, no waveform.
    const SampleFormat* iq = nullptr;
    double iq_rate = 0;
    const SampleFormat* pcm = nullptr;
    double pcm_rate = 0;
    size_t pcm_channels = 1;
    // Not a part of a tree: what is not there at the start of a set was trimmed.
    bool whole = true;
};

class CardReport : public TreeVisitor {
public:
    static constexpr size_t MAX_ROWS = 1000;    // of a table
    static constexpr size_t MAX_PICTURES = 20;  // spectra, and as many waveforms

    // Reads all files of the tree. Prints what cannot be read. The tree must stay as it is.
    CardReport(const LogTree& tree, const ReportOptions& options);

    // What the tree was read from, for humans.
    void set_roots(const std::vector<std::string>& roots);
    const Json& json() const { return m_json; }
    // "12 files, 3 damages".
    std::string words() const;
    // The exit status.
    int status() const;

private:
    struct TypeSum {
        uint64_t count = 0;
        uint64_t bytes = 0;
        uint64_t timed_bytes = 0;  // in files whose length is known
    };
    struct CpSum {
        uint64_t files = 0, size = 0;
        uint64_t logs = 0, log_size = 0, timed_size = 0, seconds = 0;
        uint64_t frames = 0, chunks = 0, broken = 0, payload = 0, other = 0;
        uint64_t sequence_gaps = 0, missing = 0;
        uint64_t damages = 0, notes = 0;
        std::map<int, TypeSum> types;  // by type * 256 + sub-type
    };
    // What was the last of a CP of one handset.
    struct Last {
        std::string version;
        LogTime byte;                  // of its last log file
        bool known = true;             // whether that is its end
        const TreeSet* set = nullptr;  // of that
    };
    struct SetSum {
        uint64_t files = 0, size = 0, damages = 0;
        LogTime from, to;
    };

    PieceVisitor begin(const FilePlace& place) override;
    void find(const std::string& path, const Finding& finding) override;
    void unreadable(const std::string& words) override;
    void end(const FilePlace& place, const FileReport& report) override;

    LogTime last_byte(const FilePlace& log);
    void add_log(const FilePlace& place, const FileReport& report, CpSum* cp);
    void add_gaps(const FilePlace& place, const LogTime& to);
    void add_pcm(const Piece& piece);
    void add_version(const FilePlace& place);
    SetSum& sum_of(const TreeSet& set) {
        return m_sets[std::min(static_cast<size_t>(&set - m_tree.sets.data()), MAX_ROWS)];
    }
    Last& last_of(const FilePlace& place) { return m_last[{place.set->handset, place.cp->name}]; }
    void add_database(const TreeFile& file);
    void add_spectrum(const FilePlace& place);
    void add_crashes();
    // Appends a row to a list of the object, or counts it where the list is full.
    void add_row(const char* list, size_t max, const Json& row);

    void write_totals();
    Json cp_json(const std::string& name, const CpSum& sum) const;
    Json waveform_json(const FilePlace& place, const Waveform& waveform) const;

    const LogTree& m_tree;
    const ReportOptions m_options;
    Json m_json;
    Timeline m_timeline;
    std::map<std::string, CpSum> m_cps;
    std::map<std::pair<size_t, std::string>, Last> m_last;  // by handset and CP
    std::map<size_t, SetSum> m_sets;  // by place in the tree; of all beyond MAX_ROWS one
    std::vector<std::pair<FilePlace, Waveform>> m_waveforms;
    std::vector<Crash> m_dsp_crashes;
    uint64_t m_more_dsp_crashes = 0;
    DspDumps m_dsp_dumps{
        [this](const DspDump& dump) { m_more_dsp_crashes += !add_crash(dump, &m_dsp_crashes); }};
    uint32_t m_next_seq = 0;                // of PCM data in one file
    const TreeCp* m_no_waveform = nullptr;  // the last one with PCM data that gets none
    uint64_t m_files = 0, m_size = 0;
    uint64_t m_damages = 0, m_notes = 0, m_unreadable = 0;
    uint64_t m_file_damages = 0;
    std::map<const TreeFile*, uint64_t> m_damaged;  // files of crashes, and their damages
    FilePlace m_place{};                            // of the file that is being scanned
};

#endif  // KESTLOG_CARDREPORT_H_
