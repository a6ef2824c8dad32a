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
    tell_dumps();
    for (auto it = m_closed.begin(); it != m_closed.end() && !m_stop;) {
        it = check(*it->first, FileName(it->second), true) ? m_closed.erase(it) : std::next(it);
    }
    for (auto& [path, dir] : m_dirs) {
        if (dir.deleted) {
            tell_deleted(dir);
        }
    }
}

void LiveTree::tell_dumps() {
    std::vector<Place> places(m_grown.begin(), m_grown.end());
    std::stable_sort(places.begin(), places.end(), [](const Place& a, const Place& b) {
        return a.first->set != b.first->set  // oldest first
                   ? a.first->set < b.first->set
                   : FileName(a.second).number > FileName(b.second).number;
    });
    for (const Place& place : places) {
        if (read_dumps(*place.first, FileName(place.second), true)) {
            m_grown.erase(place);
        }
    }
}

// False when the file has another name already, which the next change tells.
bool LiveTree::read_dumps(Dir& dir, const FileName& name, bool tell) {
    LogReader in;
    if (!in.open(dir.path + "/" + name.text(), false)) {
        return errno != ENOENT;
    }
    const auto visit = [&](bool complete, uint64_t bytes) {
        if (tell) {
            tell_crash(dir, name, "memory dump", bytes, complete);
        }
    };
    m_dumps[dir.handset].read(in, dir.path, &dir.files.at(name.text()).known, visit);
    return true;
}

void LiveTree::check_open() {
    for (auto& [path, dir] : m_dirs) {
        for (const auto& [name, file] : dir.files) {
            if (dir.present && file.unchecked && !m_stop) {
                check(dir, FileName(name), false);
            }
        }
    }
}

// False when the file has another name already, which the next change tells.
bool LiveTree::check(Dir& dir, const FileName& name, bool is_closed) {
    LogReader in;
    File& file = dir.files.at(name.text());
    const std::string path = dir.path + "/" + name.text();
    if (!name.exact && is_closed) {
        return true;  // whoever copies a file here gives it its name at the end
    }
    if (!in.open(path, false)) {
        if (errno != ENOENT) {
            m_tell(LiveEvent::notice(path + ": " + strerror(errno)));
        }
        return errno != ENOENT;
    }
    if (is_closed && in.size() == file.checked) {
        return true;
    }
    if (!name.exact) {
        tell_damage(dir, name, {true, "name", "not a file name the service creates", -1});
    }
    FileReport report;
    scan_file(
        in, name, [this](const Piece&) { return !m_stop; }, FP_LENGTH, &report);
    if (m_stop) {
        return true;
    }
    if (in.error()) {
        m_tell(LiveEvent::notice(path + ": " + strerror(in.error())));
    }
    look(dir, name.text());
    file.unchecked = false;
    for (Finding finding : report.findings) {
        if (is_closed) {
            judge_closed(name, &finding);
        }
        if (finding.damage) {
            tell_damage(dir, name, finding);
        }
    }
    if (is_closed) {
        file.checked = in.size();
    }
    if (name.is_crash() && is_closed && (!name.framed_dump || report.end_marker)) {
        tell_crash(dir, name, name.kind(), file.size, true);
    }
    return true;
}

void LiveTree::look(Dir& dir, const std::string& name) {
    struct stat st;
    if (lstat((dir.path + "/" + name).c_str(), &st) == 0) {
        const uint64_t size = static_cast<uint64_t>(st.st_size);
        File& known = dir.files.at(name);
        m_sums[cp_of(dir, name)].grown += size - std::min(size, known.size);
        known.size = size;
        known.sized = true;
    }
}

std::map<std::string, LiveTree::Sum> LiveTree::sums() {
    for (const auto& [dir, name] : m_written) {
        look(*dir, name);
    }
    m_written.clear();
    std::map<std::string, Sum> sums = m_sums;
    for (auto& [cp, sum] : m_sums) {
        sum.grown = 0;
    }
    std::map<std::string, LogTime> newest;  // of each CP
    for (const auto& [path, dir] : m_dirs) {
        const bool named = cp_type_of(dir.cp) != CT_UNKNOWN;
        for (const auto& [name, file] : dir.files) {
            if (!dir.present) {
                break;
            }
            const std::string& cp = named ? dir.cp : cp_of(dir, name);
            Sum& sum = sums[cp];
            ++sum.files;
            sum.size += file.size;
            if (name.compare(0, 2, "0-") == 0) {
                const FileName log(name);
                if (log.is_log() && newest[cp] < log.time()) {
                    newest[cp] = log.time();
                    sum.newest = name;
                }
            }
        }
    }
    return sums;
}
