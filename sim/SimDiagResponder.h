// SPDX-License-Identifier: Apache-2.0
// A CP's side of the diag exchanges, on a thread of its own: waits at the diag device for
// the service's requests (memory dump, ring buffer, sleep log) and plays the answer that
// was planned for each of them, well, slowly, wrongly or never. An external chip's memory
// is pushed without a request. What was sent is kept, so that the files that the service
// makes of it can be compared byte for byte.
//
// When the device carries the log as well, do not feed the log during an exchange, and
// let the service read what was fed before.
#ifndef SIM_SIMDIAGRESPONDER_H_
#define SIM_SIMDIAGRESPONDER_H_

#include <stddef.h>
#include <stdint.h>

#include <condition_variable>
#include <mutex>
#include <thread>
#include <vector>

#include "sim/SimStream.h"

class SimDiagDevice;

class SimDiagResponder {
public:
    enum Exchange { DUMP, RING_BUFFER, SLEEP_LOG, EXCHANGE_COUNT };
    enum Mode {
        ANSWER,
        SLOW,    // a pause of gap_ms after each piece
        REFUSE,  // a frame of sub-type 0
        WRONG,   // half the data, then what does not belong there instead of the end
        NEVER,   // not a byte
        CUT,     // half the data and no more
    };
    struct Plan {
        Mode mode = ANSWER;
        size_t size = 64 << 10;  // bytes of payload
        size_t piece = 2000;     // bytes of payload in each frame
        int gap_ms = 20;
    };

    // The device is not owned and must outlive the responder.
    SimDiagResponder(SimDiagDevice& device, uint8_t cp);
    ~SimDiagResponder() { stop(); }
    SimDiagResponder(const SimDiagResponder&) = delete;
    SimDiagResponder& operator=(const SimDiagResponder&) = delete;

    void start();
    void stop();
    // How to answer from the next request on.
    void set_plan(Exchange exchange, const Plan& plan);
    // An external chip dumps: pushes the memory unasked, unframed, as planned for DUMP (REFUSE
    // is NEVER), and then, when the service has read it all, the text that ends it.
    void push_memory();

    // Requests met and exchanges played to their end, whatever the plan.
    unsigned requests(Exchange exchange) const;
    unsigned finished(Exchange exchange) const;
    bool wait_finished(Exchange exchange, unsigned count, int timeout_ms) const;
    // Of the latest exchange: the bytes on the wire so far, and the bytes that the service
    // has to have in its file (of a dump all that was sent, without the external chip's
    // ending; of the others the payload).
    size_t sent_size(Exchange exchange) const;
    std::vector<uint8_t> sent(Exchange exchange) const;
    std::vector<uint8_t> file_content(Exchange exchange) const;

private:
    struct State {
        Plan plan;
        unsigned requests = 0;
        unsigned finished = 0;
        std::vector<uint8_t> sent;
        std::vector<uint8_t> content;
    };

    void run();
    void play(Exchange exchange, bool framed);
    bool play_data(Exchange exchange, const Plan& plan, bool framed);
    void play_end(Exchange exchange, const Plan& plan, bool framed);
    // kept: the bytes belong into the service's file as they are.
    bool send(Exchange exchange, const std::vector<uint8_t>& bytes, bool kept);
    bool send_frame(Exchange exchange, uint8_t type, uint8_t sub_type,
                    const std::vector<uint8_t>& payload);
    void add_content(Exchange exchange, const std::vector<uint8_t>& bytes);
    bool wait_read();
    bool pause(int ms);

    SimDiagDevice& m_device;
    const uint8_t m_cp;
    mutable std::mutex m_mutex;
    mutable std::condition_variable m_changed;
    State m_states[EXCHANGE_COUNT];
    bool m_stop = false;
    bool m_push = false;
    uint32_t m_sequence = 0;  // of the thread only
    std::thread m_thread;
};

#endif  // SIM_SIMDIAGRESPONDER_H_
