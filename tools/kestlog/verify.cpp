// SPDX-License-Identifier: Apache-2.0
// kestlog verify.
#include <stdio.h>

#include <nlohmann/json.hpp>

#include "common/text.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/Progress.h"
#include "kestlog/Report.h"
#include "kestlog/TreeCheck.h"
#include "kestlog/TreeInput.h"

namespace {

class Verifier : public TreeVisitor {
public:
    explicit Verifier(bool json) : m_json(json) {}

    PieceVisitor begin(const FilePlace&) override {
        ++m_files;
        return nullptr;
    }

    void find(const std::string& path, const Finding& finding) override {
        ++(finding.damage ? m_damages : m_notes);
        if (m_json) {
            Json object = finding_json(finding);
            object["path"] = json_text(path);
            print_json(object);
        } else {
            Progress::clear();
            printf("%s\n", escape_text(path + ": " + finding_text(finding)).c_str());
        }
    }

    void unreadable(const std::string& words) override {
        ++m_unreadable;
        failure(ES_UNREADABLE, words);
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
    check_tree(tree, verifier);
    return verifier.finish();
}
