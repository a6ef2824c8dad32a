// SPDX-License-Identifier: Apache-2.0

#include "kestlog/TreeCheck.h"

#include <errno.h>
#include <string.h>

#include <algorithm>

#include "kestlog/ChunkSequence.h"
#include "kestlog/LogStream.h"
#include "kestlog/Report.h"
#include "kestlog/SplitFrame.h"

namespace {

class TreeCheck {
public:
    TreeCheck(const LogTree& tree, TreeVisitor& visitor)
        : m_tree(tree), m_visitor(visitor), m_next_logs(log_streams(tree)) {}

    void run() {
        for (const std::string& path : m_tree.strays) {
            m_visitor.find(path, {true, "name", "does not belong here", -1});
        }
        for (const std::string& path : m_tree.foreign) {
            m_visitor.find(path, {false, "foreign", "left by a PC", -1});
        }
        for (const TreeFile& file : m_tree.root_files) {
            look({nullptr, nullptr, &file});
        }
        for (const TreeSet& set : m_tree.sets) {
            for (const TreeCp& cp : set.cps) {
                look_at_all(set, cp);
            }
        }
        for (const std::string& words : m_tree.failures) {
            m_visitor.unreadable(words);
        }
    }

private:
    // What is in the log goes on from file to file, whatever the clock said.
    void look_at_all(const TreeSet& set, const TreeCp& cp) {
        const std::vector<const TreeFile*> logs = logs_in_order(cp);
        for (size_t i = 0; i < logs.size(); ++i) {
            m_next = m_next_logs.after(cp, logs, i);
            look({&set, &cp, logs[i]});
        }
        m_next = nullptr;
        for (const TreeFile& file : cp.files) {  // by time
            if (!file.name.is_log()) {
                look({&set, &cp, &file});
            }
        }
    }

    void look(const FilePlace& place) {
        const PieceVisitor visit = m_visitor.begin(place);
        if (place.cp) {
            name(place);
            number(*place.file);
        } else {
            parsing_database(*place.file);
        }
        FileReport report;
        content(*place.file, visit, &report);
        m_visitor.end(place, report);
    }

    // In each log root the database and its digest must both be there, or neither.
    void parsing_database(const TreeFile& file) {
        const std::string other =
            file.dir->shown() + (file.name.text() == DIGEST_NAME ? DATABASE_NAME : DIGEST_NAME);
        const std::vector<TreeFile>& files = m_tree.root_files;
        if (std::none_of(files.begin(), files.end(),
                         [&](const TreeFile& f) { return f.shown() == other; })) {
            m_visitor.find(file.shown(), {true, "pair", "without " + file_part(other), -1});
        }
    }

    void name(const FilePlace& place) {
        const FileName& name = place.file->name;
        const CpType type = cp_type_of(place.cp->name);
        if (name.type == LT_UNKNOWN) {
            m_visitor.find(place.file->shown(),
                           {true, "name", "not a file name the service creates", -1});
        } else if (type != CT_UNKNOWN && name.cp_type != CT_UNKNOWN && name.cp_type != type) {
            m_visitor.find(place.file->shown(),
                           {true, "name", "the name belongs to another CP", -1});
        }
    }

    void number(const TreeFile& log) {
        if (log.doubled) {
            m_visitor.find(log.shown(),
                           {!log.set_aside, "double", "two log files with this number", -1});
        }
        if (log.missing) {
            m_visitor.find(log.shown(), {false, "gap", missing_text(log), -1});
        }
        if (log.disordered) {
            m_visitor.find(log.shown(),
                           {false, "order", "newer than a log file with a lower number", -1});
        }
    }

    void content(const TreeFile& file, const PieceVisitor& visit, FileReport* report) {
        LogReader in;
        if (!in.open(file.path(), false)) {
            if (errno == ENOENT) {
                // The service may rename and trim files while they are checked.
                m_visitor.find(file.shown(),
                               {false, "gone", "gone or renamed since the directory was read", -1});
            } else {
                m_visitor.unreadable(file.shown() + ": " + strerror(errno));
            }
            return;
        }
        if (file.name.is_log() && file.name.cp_type == CT_AGDSP) {
            m_sequence.enter(*file.dir);
            const auto take = [&](const Piece& piece) {
                m_sequence.take(piece, report);
                return !visit || visit(piece);
            };
            scan_file(in, file.name, take, FP_LENGTH, report);
        } else {
            scan_file(in, file.name, visit, FP_LENGTH, report);
            m_split.end_file(file, in.size(), m_next, visit, report);
        }
        if (in.error()) {
            m_visitor.unreadable(file.shown() + ": " + strerror(in.error()));
        }
        for (const Finding& finding : report->all_findings()) {
            m_visitor.find(file.shown(), finding);
        }
    }

    const LogTree& m_tree;
    TreeVisitor& m_visitor;
    ChunkSequence m_sequence;
    const NextLogs m_next_logs;
    SplitFrame m_split;
    const TreeFile* m_next = nullptr;  // the log file that goes on where the one in hand ends
};

}  // namespace

void check_tree(const LogTree& tree, TreeVisitor& visitor) {
    TreeCheck(tree, visitor).run();
}
