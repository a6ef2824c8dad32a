// SPDX-License-Identifier: Apache-2.0

#include "kestlog/ExportPlan.h"

#include <strings.h>

#include <algorithm>
#include <map>
#include <utility>

#include "common/text.h"
#include "kestlog/small_files.h"

namespace {

bool is_wanted(const std::string& cp, const std::string& wanted) {
    return wanted.empty() || strcasecmp(cp.c_str(), wanted.c_str()) == 0;
}

// Whether its bytes are framed. Without a name of the service it may be anything.
bool has_frames(const TreeFile& file, bool given) {
    return file.name.framed_dump || (given && !file.name.exact);
}

ExportInterface interface_of(const ExportSource& source) {
    const TreeSet& set = *source.set;
    // That stands beside the file; "" without one.
    int ignored;
    const std::string cp = source.file->name.cp();
    const std::string version =
        cp.empty() ? "" : read_version(version_path(source.file->dir->path(), cp), &ignored);
    std::string description =
        set.name.empty() ? set.shown() : "set " + set.name + " on " + set.medium();
    description += version.empty() ? "" : ", firmware " + version;
    return {escape_text(source.cp->name.empty() ? source.file->name.text() : source.cp->name),
            escape_text(description), 1};
}

}  // namespace

ExportPlan::ExportPlan(const LogTree& tree, const std::string& cp) {
    const NextLogs next = [&] {  // the streams are needed no longer then
        const std::vector<LogStream> streams = log_streams(tree);
        find_sources(tree, streams, cp);
        return NextLogs(streams);
    }();
    std::stable_sort(sources.begin(), sources.end(),
                     [](const ExportSource& a, const ExportSource& b) {
                         return a.order.time() < b.order.time();
                     });
    find_interfaces(next);
}

uint64_t ExportPlan::size() const {
    uint64_t bytes = 0;
    for (const ExportSource& source : sources) {
        bytes += source.file->size;
    }
    return bytes;
}

void ExportPlan::find_sources(const LogTree& tree, const std::vector<LogStream>& streams,
                              const std::string& cp) {
    // A list that grows takes its space twice.
    size_t files = 0;
    for (const TreeSet& set : tree.sets) {
        for (const TreeCp& dir : set.cps) {
            files += dir.files.size();
        }
    }
    sources.reserve(files);
    for (const LogStream& stream : streams) {
        LogTime order;
        for (const StreamFile& log : stream.files) {
            order = std::max(order, log.file->name.time());
            if (is_wanted(stream.cp, cp)) {
                sources.push_back({log.set, log.cp, log.file, ShortTime(order)});
            }
        }
    }
    for (const TreeSet& set : tree.sets) {
        for (const TreeCp& dir : set.cps) {
            for (const TreeFile& file : dir.files) {
                if (file.name.is_log() || !is_wanted(dir.name, cp)) {
                    continue;
                }
                const ExportSource source = {&set, &dir, &file, ShortTime(file.name.time())};
                if (has_frames(file, set.given)) {
                    sources.push_back(source);
                } else {
                    ++left_out;
                }
            }
        }
    }
}

void ExportPlan::find_interfaces(const NextLogs& next) {
    std::map<std::pair<const TreeSet*, std::string>, uint32_t> numbers;
    std::vector<ExportSource*> last_logs;  // of each interface
    for (ExportSource& source : sources) {
        const auto number = static_cast<uint32_t>(interfaces.size());
        const auto [it, is_new] = numbers.insert({{source.set, source.cp->name}, number});
        source.interface = it->second;
        if (is_new) {
            interfaces.push_back(interface_of(source));
            last_logs.push_back(nullptr);
        }
        if (!source.file->name.is_log()) {
            source.queue = interfaces[source.interface].queues++;
            continue;
        }
        ExportSource*& last = last_logs[source.interface];
        if (last) {
            last->next = next.after(*last->cp, *last->file, source.file);
        }
        last = &source;
    }
    for (ExportSource* const last : last_logs) {
        if (last) {
            last->next = next.after(*last->cp, *last->file, nullptr);
        }
    }
}
