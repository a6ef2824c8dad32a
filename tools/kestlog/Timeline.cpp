// SPDX-License-Identifier: Apache-2.0

#include "kestlog/Timeline.h"

#include <algorithm>
#include <nlohmann/json.hpp>

void TimelineItem::merge(const TimelineItem& next) {
    take_earlier(&from, next.from);
    to = std::max(to, next.to);
    files += next.files;
    size += next.size;
    timed_size += next.timed_size;
    seconds += next.seconds;
    damages += next.damages;
    sequence_gaps += next.sequence_gaps;
    items += next.items;
}

void Timeline::add(const std::string& cp, const std::string& kind, const TimelineItem& item) {
    Series& series = m_series[{cp, kind}];
    std::vector<TimelineItem>& items = series.items;
    if (!items.empty() && items.back().items < series.per_item) {
        items.back().merge(item);
        return;
    }
    if (items.size() >= (kind == TK_LOG ? m_max_logs : MAX_EVENTS)) {
        // Twice as many in each from now on.
        const size_t count = items.size();
        for (size_t i = 0; i < count; ++i) {
            if (i % 2) {
                items[i / 2].merge(items[i]);
            } else if (i > 0) {
                items[i / 2] = std::move(items[i]);
            }
        }
        items.resize((count + 1) / 2);
        series.per_item *= 2;
        add(cp, kind, item);
        return;
    }
    items.push_back(item);
}

uint64_t Timeline::most_merged() const {
    uint64_t most = 1;
    for (const auto& [key, series] : m_series) {
        most = std::max(most, series.per_item);
    }
    return most;
}

Json Timeline::json() const {
    Json list = Json::array();
    for (const auto& [key, series] : m_series) {
        for (const TimelineItem& item : series.items) {
            Json object = {{"cp", json_text(key.first)},
                           {"kind", key.second},
                           {"from", time_text(item.from)},
                           {"to", time_text(item.to)}};
            if (item.set) {
                object["set"] = json_text(item.set->name);
                object["medium"] = json_text(item.set->medium());
            }
            if (item.files) {
                object["files"] = item.files;
                object["name"] = json_text(item.name);
                object["size"] = item.size;
                object["damages"] = item.damages;
            }
            if (item.sequence_gaps) {
                object["sequence_gaps"] = item.sequence_gaps;
            }
            if (item.seconds) {
                object["rate"] = item.timed_size / item.seconds;
            }
            if (!item.words.empty()) {
                object["words"] = json_text(item.words);
            }
            if (item.items > 1) {
                object["items"] = item.items;
            }
            list.push_back(std::move(object));
        }
    }
    return list;
}
