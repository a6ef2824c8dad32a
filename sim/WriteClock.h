// SPDX-License-Identifier: Apache-2.0
// Notes when files in some directories are written to, on a thread of its own, so that
// the gaps between the writes can be told. Files are told apart by directory only.
#ifndef SIM_WRITECLOCK_H_
#define SIM_WRITECLOCK_H_

#include <stdint.h>

#include <string>
#include <thread>
#include <utility>
#include <vector>

class WriteClock {
public:
    struct Gap {
        unsigned writes = 0;    // of the directory with the fewest
        double largest_ms = 0;  // of any one directory
    };

    WriteClock() = default;
    ~WriteClock() { stop(); }
    WriteClock(const WriteClock&) = delete;
    WriteClock& operator=(const WriteClock&) = delete;

    // Watches log files (names beginning "0-") in the directories. False with errno set on
    // failure.
    bool start(const std::vector<std::string>& dirs);
    void stop();

    // After stop: what happened between two times, in ns of the steady clock. A gap also
    // reaches from the start to the first write and from the last write to the end.
    Gap gap(int64_t from_ns, int64_t to_ns) const;
    static int64_t now_ns();

private:
    void run();

    int m_notify = -1;
    int m_wake[2] = {-1, -1};  // closing the writing end ends the thread
    std::thread m_thread;
    std::vector<int> m_watches;                     // one for each directory
    std::vector<std::pair<int, int64_t>> m_writes;  // watch and time
};

#endif  // SIM_WRITECLOCK_H_
