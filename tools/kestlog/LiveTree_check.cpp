// SPDX-License-Identifier: Apache-2.0
// What is in the files of the live tree: their sizes, and damage.
#include <errno.h>
#include <string.h>
#include <sys/stat.h>

#include <algorithm>

#include "common/text.h"
#include "kestlog/LiveTree.h"

namespace {

// What is only a note while the file is being written is damage once it is closed.
void judge_closed(const FileName& name, Finding* finding) {
    const std::string code = finding->code;
    if (code == "cut" || code == "end" || (code == "empty" && name.framed_dump)) {
        finding->damage = true;
        finding->words = code == "cut"   ? "the last chunk is cut off"
                         : code == "end" ? "the dump has no end marker"
                                         : finding->words;
    }
}

}  // namespace

void LiveTree::settle() {
    for (auto it = m_closed.begin(); it != m_closed.end() && !m_stop;) {
        Dir& dir = *it->first;
        it = check(dir, dir.files.at(it->second), true) ? m_closed.erase(it) : std::next(it);
    }
    for (auto& [path, dir] : m_dirs) {
        if (dir.deleted) {
            tell_deleted(dir);
        }
    }
}

void LiveTree::check_open() {
    for (auto& [path, dir] : m_dirs) {
        for (auto& [name, file] : dir.files) {
            if (dir.present && file.unchecked && !m_stop) {
                check(dir, file, false);
            }
        }
    }
}

// False when the file has another name already, which the next change tells.
bool LiveTree::check(Dir& dir, File& file, bool is_closed) {
    LogReader in;
    if (!file.name.exact && is_closed) {
        return true;  // whoever copies a file here gives it its name at the end
    }
    if (!in.open(dir.path + "/" + file.name.text, false)) {
        if (errno != ENOENT) {
            m_tell(LiveEvent::notice(dir.path + "/" + file.name.text + ": " + strerror(errno)));
        }
        return errno != ENOENT;
    }
    if (is_closed && in.size() == file.checked) {
        return true;
    }
    if (!file.name.exact) {
        tell_damage(dir, file, {true, "name", "not a file name the service creates", -1});
    }
    FileReport report;
    scan_file(
        in, file.name, [this](const Piece&) { return !m_stop; }, &report);
    if (m_stop) {
        return true;
    }
    if (in.error()) {
        m_tell(LiveEvent::notice(dir.path + "/" + file.name.text + ": " + strerror(in.error())));
    }
    look(dir, file);
    file.unchecked = false;
    for (Finding finding : report.findings) {
        if (is_closed) {
            judge_closed(file.name, &finding);
        }
        if (finding.damage) {
            tell_damage(dir, file, finding);
        }
    }
    if (is_closed) {
        file.checked = in.size();
    }
    if (file.name.is_crash() && is_closed && (!file.name.framed_dump || report.end_marker)) {
        tell("crash", dir, file,
             std::string(file.name.kind) + " is complete: " + escape_text(file.name.text) + ", " +
                 size_text(file.size),
             {{"state", "complete"}});
    }
    return true;
}

void LiveTree::look(Dir& dir, File& file) {
    struct stat st;
    if (lstat((dir.path + "/" + file.name.text).c_str(), &st) == 0) {
        const uint64_t size = static_cast<uint64_t>(st.st_size);
        m_sums[cp_of(dir, file)].grown += size - std::min(size, file.size);
        file.size = size;
    }
}

std::map<std::string, LiveTree::Sum> LiveTree::sums() {
    for (const auto& [dir, name] : m_written) {
        look(*dir, dir->files.at(name));
    }
    m_written.clear();
    std::map<std::string, Sum> sums = m_sums;
    for (auto& [cp, sum] : m_sums) {
        sum.grown = 0;
    }
    for (const auto& [path, dir] : m_dirs) {
        if (dir.present) {
            for (const auto& [text, file] : dir.files) {
                const FileName& name = file.name;
                Sum& sum = sums[cp_of(dir, file)];
                ++sum.files;
                sum.size += file.size;
                if (name.is_log() &&
                    (sum.newest.time < name.time ||
                     (!(name.time < sum.newest.time) && name.number < sum.newest.number))) {
                    sum.newest = name;
                }
            }
        }
    }
    return sums;
}
