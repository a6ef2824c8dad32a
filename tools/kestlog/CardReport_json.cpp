// SPDX-License-Identifier: Apache-2.0
// The sums of the report, which are known at its end.
#include <algorithm>
#include <cmath>

#include "kestlog/CardReport.h"
#include "kestlog/ExitStatus.h"

namespace {

// Types of a CP that are listed one by one.
constexpr size_t MAX_TYPES = 100;

// Where it took no time there is no rate.
void add_rate(Json* json, uint64_t amount, uint64_t seconds) {
    if (seconds) {
        (*json)["rate"] = amount / seconds;
    }
}

}  // namespace

std::string CardReport::words() const {
    std::string text = std::to_string(m_files) + " files, " + std::to_string(m_damages) +
                       " damages, " + std::to_string(m_notes) + " notes";
    return m_unreadable ? text + ", " + std::to_string(m_unreadable) + " unreadable" : text;
}

int CardReport::status() const {
    return m_damages ? ES_DAMAGE : m_unreadable ? ES_UNREADABLE : ES_OK;
}

void CardReport::set_roots(const std::vector<std::string>& roots) {
    Json list = Json::array();
    for (const std::string& root : roots) {
        list.push_back(json_text(root));
    }
    m_json["roots"] = std::move(list);
}

void CardReport::write_totals() {
    LogTime from, to;
    for (const TreeSet& set : m_tree.sets) {
        const SetSum& sum = sum_of(set);
        add_row("sets", MAX_ROWS,
                {{"set", json_text(set.name)},
                 {"medium", json_text(set.medium())},
                 {"path", json_text(set.shown())},
                 {"time", time_text(set.time)},
                 {"from", time_text(sum.from)},
                 {"to", time_text(sum.to)},
                 {"cps", set.cps.size()},
                 {"files", sum.files},
                 {"size", sum.size},
                 {"damages", sum.damages}});
        for (const LogTime& time : {m_options.whole ? set.time : LogTime(), sum.from}) {
            take_earlier(&from, time);
        }
        to = std::max({to, sum.to, from});
    }
    for (const auto& [name, sum] : m_cps) {
        add_row("cps", MAX_ROWS, cp_json(name, sum));
    }
    for (const auto& [place, waveform] : m_waveforms) {
        if (waveform.samples()) {
            m_json["waveforms"].push_back(waveform_json(place, waveform));
        }
    }
    m_json["timeline"] = m_timeline.json();
    m_json["most_merged"] = m_timeline.most_merged();
    m_json["from"] = time_text(from);
    m_json["to"] = time_text(to);
    m_json["version"] = KEST_VERSION;
    m_json["totals"] = {{"sets", m_tree.sets.size()}, {"cps", m_cps.size()},
                        {"files", m_files},           {"size", m_size},
                        {"damages", m_damages},       {"notes", m_notes},
                        {"unreadable", m_unreadable}};
}

Json CardReport::cp_json(const std::string& name, const CpSum& sum) const {
    Json types = Json::array();
    uint64_t more = 0;
    std::vector<std::pair<int, TypeSum>> sorted(sum.types.begin(), sum.types.end());
    std::stable_sort(sorted.begin(), sorted.end(),
                     [](const auto& a, const auto& b) { return a.second.bytes > b.second.bytes; });
    for (const auto& [type, amount] : sorted) {
        if (types.size() < MAX_TYPES) {
            types.push_back({{"type", type / 256},
                             {"sub_type", type % 256},
                             {"count", amount.count},
                             {"bytes", amount.bytes}});
            add_rate(&types.back(), amount.timed_bytes, sum.seconds);
        } else {
            ++more;
        }
    }
    Json json = {
        {"cp", json_text(name)},  {"files", sum.files},       {"size", sum.size},
        {"logs", sum.logs},       {"log_size", sum.log_size}, {"seconds", sum.seconds},
        {"frames", sum.frames},   {"chunks", sum.chunks},     {"broken", sum.broken},
        {"payload", sum.payload}, {"other_bytes", sum.other}, {"sequence_gaps", sum.sequence_gaps},
        {"missing", sum.missing}, {"damages", sum.damages},   {"notes", sum.notes},
        {"types", types}};
    add_rate(&json, sum.timed_size, sum.seconds);
    if (more) {
        json["more_types"] = more;
    }
    return json;
}

Json CardReport::waveform_json(const FilePlace& place, const Waveform& waveform) const {
    Json channels = Json::array();
    const size_t n = m_options.pcm_channels;
    const auto thousandths = [](float value) {
        return std::lround(1000 * std::clamp(value, -1.0f, 1.0f));
    };
    for (size_t c = 0; c < n; ++c) {
        Json points = Json::array();
        for (size_t i = c; i < waveform.points().size(); i += n) {
            const auto& [least, greatest] = waveform.points()[i];
            points.push_back(thousandths(least));
            points.push_back(thousandths(greatest));
        }
        channels.push_back(std::move(points));
    }
    return {{"cp", json_text(place.cp->name)},
            {"set", json_text(place.set->name)},
            {"medium", json_text(place.set->medium())},
            {"format", m_options.pcm->pcm},
            {"rate", m_options.pcm_rate},
            {"samples", waveform.samples()},
            {"samples_per_point", waveform.samples_per_point()},
            {"channels", channels}};
}
