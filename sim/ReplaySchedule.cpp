// SPDX-License-Identifier: Apache-2.0

#include "sim/ReplaySchedule.h"

#include <algorithm>
#include <cmath>
#include <limits>

namespace {

// A CP that fills its file more slowly does not: the clock was set in between, for example
// when a handset learned the time from the network.
const int64_t LONGEST_S = 24 * 3600;
const double DEFAULT_RATE = 500 * 1024;  // bytes/s, when all files of a CP were the last ones

}  // namespace

ReplaySchedule::ReplaySchedule(const RecordedCp& cp) {
    const std::vector<RecordedFile>& files = cp.files;
    double known_s = 0;
    double known_bytes = 0;
    uint64_t first = 0;
    // Names have a resolution of a second: files of the same second share the time to the next.
    for (size_t i = 0, behind = 0; i < files.size(); i = behind) {
        Span span = {static_cast<double>(files[i].time), std::nan(""), first, 0};
        for (; behind < files.size() && files[behind].set == files[i].set &&
               files[behind].time == files[i].time;
             ++behind) {
            span.bytes += files[behind].size;
        }
        first += span.bytes;
        if (behind < files.size() && files[behind].set == files[i].set) {
            const int64_t lasted = files[behind].time - files[i].time;
            if (lasted > 0 && lasted <= LONGEST_S) {
                span.end = span.start + static_cast<double>(lasted);
                known_s += static_cast<double>(lasted);
                known_bytes += static_cast<double>(span.bytes);
            }
        }
        m_spans.push_back(span);
    }
    const double rate = known_bytes > 0 ? known_bytes / known_s : DEFAULT_RATE;
    double earliest = -std::numeric_limits<double>::infinity();
    for (size_t i = 0; i < m_spans.size(); ++i) {
        Span& span = m_spans[i];
        // After a clock that was set back everything is later by as much.
        const double late = std::max(0.0, earliest - span.start);
        span.start += late;
        span.end += late;
        if (std::isnan(span.end)) {
            span.end = span.start + static_cast<double>(span.bytes) / rate;
            // What came next came later, if the clock is right.
            if (i + 1 < m_spans.size() && m_spans[i + 1].start > span.start) {
                span.end = std::min(span.end, m_spans[i + 1].start);
            }
        }
        earliest = span.end;
    }
}

uint64_t ReplaySchedule::due(double time) const {
    const auto behind = std::partition_point(m_spans.begin(), m_spans.end(),
                                             [&](const Span& s) { return s.start <= time; });
    if (behind == m_spans.begin()) {
        return 0;
    }
    const Span& span = behind[-1];
    if (time >= span.end) {
        return span.first + span.bytes;
    }
    const double part = (time - span.start) / (span.end - span.start);
    return span.first + static_cast<uint64_t>(part * static_cast<double>(span.bytes));
}

double ReplaySchedule::file_start(uint64_t position) const {
    const auto span = std::partition_point(m_spans.begin(), m_spans.end(), [&](const Span& s) {
        return s.first + s.bytes <= position;
    });
    return span == m_spans.end() ? std::numeric_limits<double>::infinity() : span->start;
}
