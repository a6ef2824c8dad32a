// SPDX-License-Identifier: Apache-2.0
// When which byte of a recorded log was logged, as far as the names of its files tell: a file's
// bytes came evenly between its time and that of the next file. Where there is no next file in
// the set, or the clock was changed meanwhile, they came at the CP's mean rate.
#ifndef SIM_REPLAYSCHEDULE_H_
#define SIM_REPLAYSCHEDULE_H_

#include <stdint.h>

#include <vector>

#include "sim/RecordedCard.h"

class ReplaySchedule {
public:
    explicit ReplaySchedule(const RecordedCp& cp);

    // Times are seconds of the recording's local time. The bytes that were logged by then,
    // of size() of the CP.
    uint64_t due(double time) const;
    // When the log file was started that holds the byte at this position, or the first of those
    // that share a time; infinity when there are no more.
    double file_start(uint64_t position) const;

private:
    struct Span {
        double start;
        double end;
        uint64_t first;  // byte
        uint64_t bytes;
    };

    std::vector<Span> m_spans;  // in order; they do not overlap
};

#endif  // SIM_REPLAYSCHEDULE_H_
