// SPDX-License-Identifier: Apache-2.0
// What a report draws: the log files, gaps and events of every CP over time. It keeps a limited
// number of each kind for a CP; when there are more, neighbours are merged.
#ifndef KESTLOG_TIMELINE_H_
#define KESTLOG_TIMELINE_H_

#include <stdint.h>

#include <map>
#include <string>
#include <utility>
#include <vector>

#include "kestlog/LogTree.h"
#include "kestlog/Report.h"

// Kinds of items, in the order in which they are drawn.
constexpr char TK_LOG[] = "log";
constexpr char TK_TRIMMED[] = "trimmed";  // no log from the start of a set on
constexpr char TK_SILENCE[] = "silence";  // no log between two files
constexpr char TK_MISSING[] = "missing";  // numbers are missing
constexpr char TK_CRASH[] = "crash";
constexpr char TK_FIRMWARE[] = "firmware";  // another version than before
// And what FileName calls a ring buffer, a sleep log and I/Q samples.

struct TimelineItem {
    LogTime from, to;
    uint64_t files = 0;
    uint64_t size = 0;
    uint64_t timed_size = 0;  // of the files whose length is known
    uint64_t seconds = 0;     // that these last together
    uint64_t damages = 0;
    uint64_t sequence_gaps = 0;
    const TreeSet* set = nullptr;
    std::string name;   // of the first file
    std::string words;  // of the first item
    uint64_t items = 1;

    void merge(const TimelineItem& next);
};

class Timeline {
public:
    static constexpr size_t MAX_LOGS = 5000;   // of all CPs
    static constexpr size_t MAX_EVENTS = 200;  // of one kind of a CP

    explicit Timeline(size_t cps) : m_max_logs(MAX_LOGS / (cps ? cps : 1) + 2) {}

    void add(const std::string& cp, const std::string& kind, const TimelineItem& item);
    // The most that one drawn item stands for.
    uint64_t most_merged() const;
    Json json() const;

private:
    typedef std::pair<std::string, std::string> Key;  // CP and kind
    struct Series {
        std::vector<TimelineItem> items;
        uint64_t per_item = 1;
    };

    const size_t m_max_logs;
    std::map<Key, Series> m_series;
};

#endif  // KESTLOG_TIMELINE_H_
