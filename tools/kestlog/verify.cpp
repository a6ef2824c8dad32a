// SPDX-License-Identifier: Apache-2.0
// kestlog verify.
#include <errno.h>
#include <stdio.h>
#include <string.h>

#include <algorithm>
#include <nlohmann/json.hpp>

#include "common/text.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/Progress.h"
#include "kestlog/Report.h"
#include "kestlog/TreeInput.h"

namespace {

class Verifier {
public:
    explicit Verifier(bool json) : m_json(json) {}

    void tree(const LogTree& tree) {
        for (const std::string& path : tree.strays) {
            find(path, {true, "name", "does not belong here", -1});
        }
        for (const std::string& path : tree.foreign) {
            find(path, {false, "foreign", "left by a PC", -1});
        }
        for (const TreeFile& file : tree.root_files) {
            content(file);
        }
        parsing_database(tree.root_files);
        for (const TreeSet& set : tree.sets) {
            for (const TreeCp& cp : set.cps) {
                names(cp);
                numbers(cp);
                for (const TreeFile& file : cp.files) {
                    content(file);
                }
            }
        }
        for (const std::string& words : tree.failures) {
            unreadable(words);
        }
    }

    int finish() const {
        if (m_json) {
            print_json({{"ok", m_damages == 0 && m_unreadable == 0},
                        {"files", m_files},
                        {"damages", m_damages},
                        {"notes", m_notes},
                        {"unreadable", m_unreadable}});
        } else {
            Progress::clear();
            printf("%llu files checked, %llu damages, %llu notes\n",
                   static_cast<unsigned long long>(m_files),
                   static_cast<unsigned long long>(m_damages),
                   static_cast<unsigned long long>(m_notes));
        }
        return m_damages ? ES_DAMAGE : m_unreadable ? ES_UNREADABLE : ES_OK;
    }

private:
    void find(const std::string& path, const Finding& finding) {
        ++(finding.damage ? m_damages : m_notes);
        if (m_json) {
            Json object = finding_json(finding);
            object["path"] = json_text(path);
            print_json(object);
        } else {
            Progress::clear();
            printf("%s: %s\n", escape_text(path).c_str(), finding_text(finding).c_str());
        }
    }

    void unreadable(const std::string& words) {
        ++m_unreadable;
        failure(ES_UNREADABLE, words);
    }

    // In each log root the database and its digest must both be there, or neither.
    void parsing_database(const std::vector<TreeFile>& files) {
        for (const TreeFile& file : files) {
            const std::string dir = file.dir->shown;
            const std::string other =
                dir + (file.name.text == DIGEST_NAME ? DATABASE_NAME : DIGEST_NAME);
            if (std::none_of(files.begin(), files.end(),
                             [&](const TreeFile& f) { return f.shown() == other; })) {
                find(file.shown(), {true, "pair", "without " + file_part(other), -1});
            }
        }
    }

    void names(const TreeCp& cp) {
        const CpType type = cp_type_of(cp.name);
        for (const TreeFile& file : cp.files) {
            const FileName& name = file.name;
            if (name.type == LT_UNKNOWN) {
                find(file.shown(), {true, "name", "not a file name the service creates", -1});
            } else if (type != CT_UNKNOWN && name.cp_type != CT_UNKNOWN && name.cp_type != type) {
                find(file.shown(), {true, "name", "the name belongs to another CP", -1});
            }
        }
    }

    void numbers(const TreeCp& cp) {
        for (const TreeFile& log : cp.files) {
            if (log.doubled) {
                find(log.shown(), {!log.set_aside, "double", "two log files with this number", -1});
            }
            if (log.missing) {
                find(log.shown(), {false, "gap", missing_text(log), -1});
            }
            if (log.disordered) {
                find(log.shown(),
                     {false, "order", "newer than a log file with a lower number", -1});
            }
        }
    }

    void content(const TreeFile& file) {
        ++m_files;
        LogReader in;
        if (!in.open(file.path(), false)) {
            if (errno == ENOENT) {
                // The service may rename and trim files while they are checked.
                find(file.shown(),
                     {false, "gone", "gone or renamed since the directory was read", -1});
            } else {
                unreadable(file.shown() + ": " + strerror(errno));
            }
            return;
        }
        FileReport report;
        scan_file(in, file.name, nullptr, &report);
        if (in.error()) {
            unreadable(file.shown() + ": " + strerror(in.error()));
        }
        for (const Finding& finding : report.findings) {
            find(file.shown(), finding);
        }
        if (report.more_findings) {
            find(file.shown(), {report.damaged, "more",
                                std::to_string(report.more_findings) + " more findings", -1});
        }
    }

    bool m_json;
    uint64_t m_files = 0;
    uint64_t m_damages = 0;
    uint64_t m_notes = 0;
    uint64_t m_unreadable = 0;
};

}  // namespace

int run_verify(const CommandLine& line) {
    LogTree tree;
    int status;
    if (!open_tree(line, &tree, &status)) {
        return status;
    }
    const Progress progress(tree.size());
    Verifier verifier(line.has("json"));
    verifier.tree(tree);
    return verifier.finish();
}
