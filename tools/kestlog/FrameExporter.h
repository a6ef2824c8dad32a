// SPDX-License-Identifier: Apache-2.0
// Makes packets of the frames and chunks in the files of a plan. A CP's log may hold anything,
// and bytes between two flags are not yet a frame: only intact ones become packets, unless broken
// ones are asked for. How much is in no packet stands in the comments on the packets around it.
// Owned by kestlog export; the plan and the writer have to outlive it.
#ifndef KESTLOG_FRAMEEXPORTER_H_
#define KESTLOG_FRAMEEXPORTER_H_

#include <stdint.h>

#include <string>
#include <vector>

#include "kestlog/ExportPlan.h"
#include "kestlog/FileScan.h"
#include "kestlog/PcapngWriter.h"
#include "kestlog/SplitFrame.h"

class FrameExporter {
public:
    struct Wanted {
        int type = -1;        // frames of other types are left out; -1: of none
        bool broken = false;  // also bytes between flags with another length in their header
    };

    struct Totals {
        uint64_t files = 0;    // that could be opened
        uint64_t packets = 0;  // written
        uint64_t broken = 0;   // how many of them are
        uint64_t other = 0;    // bytes outside frames and chunks, or in broken ones left out
    };

    FrameExporter(const ExportPlan& plan, PcapngWriter* writer, const Wanted& wanted)
        : m_writer(*writer), m_wanted(wanted), m_remarks(plan.interfaces.size()) {}

    // Called for the sources of the plan, in their order. Prints damage; returns the exit status.
    int add(const ExportSource& source);
    const Totals& totals() const { return m_totals; }

private:
    std::string& remarks() { return m_remarks[m_source->interface]; }
    std::string file_name() const { return m_source->file->name.text(); }
    void begin();
    bool take(const Piece& piece);
    void end(const LogReader& in);
    void lost(int error);  // the file, or its end, could not be read
    bool write(int64_t time, uint8_t type, const uint8_t* data, size_t len);
    void remark_next(const std::string& text);
    void remark_last(const std::string& text);
    std::string outside(uint64_t bytes, const std::string& where);

    PcapngWriter& m_writer;
    const Wanted m_wanted;
    std::vector<std::string> m_remarks;  // for the comment on the next packet of each interface
    Totals m_totals;
    SplitFrame m_split;

    // About the file in progress.
    const ExportSource* m_source = nullptr;
    const FileReport* m_report = nullptr;
    bool m_begun = false;
    bool m_any = false;    // it has the last packet that was written
    bool m_named = false;  // a comment has said which file it is
    int64_t m_time = 0;
    uint64_t m_end = 0;   // of the last piece
    uint64_t m_tail = 0;  // where the next one may begin: also with the flag that ends broken bytes
};

#endif  // KESTLOG_FRAMEEXPORTER_H_
