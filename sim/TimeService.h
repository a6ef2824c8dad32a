// SPDX-License-Identifier: Apache-2.0
// The handset's time service: the local socket "cp_time_sync_server" (with "@" and the
// root behind it), answered on a thread of its own with 12 bytes for each connection:
// seconds since 1970 (32 bits) and a running number (64 bits), both little-endian.
// Can be told to misbehave, also while it runs.
#ifndef SIM_TIMESERVICE_H_
#define SIM_TIMESERVICE_H_

#include <stddef.h>
#include <stdint.h>

#include <atomic>
#include <string>
#include <thread>

class TimeService {
public:
    static constexpr size_t REPLY_SIZE = 12;

    TimeService() = default;
    ~TimeService() { stop(); }
    TimeService(const TimeService&) = delete;
    TimeService& operator=(const TimeService&) = delete;

    // Listens for the handset at this root, exactly as the service is told it. False with
    // errno set on failure (ENAMETOOLONG when the root's path is too long for a name).
    bool start(const std::string& root);
    // The service is gone: nobody listens any more. start() brings it back.
    void stop();
    bool running() const { return m_listen >= 0; }

    // Answer after this many milliseconds; 0 as soon as asked.
    void set_delay(int ms) { m_delay_ms = ms; }
    // Answer with only the first bytes of the reply and hang up.
    void set_reply_size(size_t bytes) { m_reply_size = bytes; }
    // Answer with these bytes. Before start().
    void set_reply(const std::string& bytes) { m_reply = bytes; }
    // Give this time instead of the present; 0 for the present.
    void set_time(uint32_t seconds) { m_seconds = seconds; }
    // Connections answered so far.
    unsigned served() const { return m_served; }

private:
    void run();
    void answer(int fd);

    std::string m_reply;  // empty: the time and the number
    int m_listen = -1;
    int m_wake[2] = {-1, -1};  // closing the writing end ends the thread
    std::thread m_thread;
    std::atomic<int> m_delay_ms{0};
    std::atomic<size_t> m_reply_size{REPLY_SIZE};
    std::atomic<uint32_t> m_seconds{0};
    std::atomic<unsigned> m_served{0};
};

#endif  // SIM_TIMESERVICE_H_
