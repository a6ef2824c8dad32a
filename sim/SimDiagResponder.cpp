// SPDX-License-Identifier: Apache-2.0

#include "sim/SimDiagResponder.h"

#include <string.h>

#include <algorithm>
#include <chrono>
#include <string>

#include "sim/DiagFrame.h"
#include "sim/SimDiagDevice.h"

namespace {

using std::chrono::milliseconds;

const uint8_t DUMP_TYPE = 0x9d;  // the service looks at no type in a dump
const uint8_t OTHER_TYPE = 0x98;
const uint8_t SUB_UNEXPECTED = 0x42;

// A service that has not read for so long will not read the rest.
const int GIVE_UP_MS = 3000;
const int POLL_MS = 20;

std::vector<uint8_t> to_bytes(const std::string& text) {
    return std::vector<uint8_t>(text.begin(), text.end());
}

uint8_t type_of(SimDiagResponder::Exchange exchange) {
    switch (exchange) {
        case SimDiagResponder::RING_BUFFER:
            return RING_BUFFER_TYPE;
        case SimDiagResponder::SLEEP_LOG:
            return SLEEP_LOG_TYPE;
        default:
            return DUMP_TYPE;
    }
}

}  // namespace

SimDiagResponder::SimDiagResponder(SimDiagDevice& device, uint8_t cp)
    : m_device(device), m_cp(cp) {}

void SimDiagResponder::start() {
    stop();
    m_stop = false;
    m_thread = std::thread(&SimDiagResponder::run, this);
}

void SimDiagResponder::stop() {
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_stop = true;
    }
    m_changed.notify_all();
    if (m_thread.joinable()) {
        m_thread.join();
    }
}

void SimDiagResponder::set_plan(Exchange exchange, const Plan& plan) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_states[exchange].plan = plan;
}

void SimDiagResponder::push_memory() {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_push = true;
}

unsigned SimDiagResponder::requests(Exchange exchange) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_states[exchange].requests;
}

unsigned SimDiagResponder::finished(Exchange exchange) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_states[exchange].finished;
}

bool SimDiagResponder::wait_finished(Exchange exchange, unsigned count, int timeout_ms) const {
    std::unique_lock<std::mutex> lock(m_mutex);
    return m_changed.wait_for(lock, milliseconds(timeout_ms),
                              [&] { return m_states[exchange].finished >= count; });
}

size_t SimDiagResponder::sent_size(Exchange exchange) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_states[exchange].sent.size();
}

std::vector<uint8_t> SimDiagResponder::sent(Exchange exchange) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_states[exchange].sent;
}

std::vector<uint8_t> SimDiagResponder::file_content(Exchange exchange) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_states[exchange].content;
}

void SimDiagResponder::run() {
    std::vector<uint8_t> request;
    for (;;) {
        const std::vector<uint8_t> bytes = m_device.read_request(1, POLL_MS);
        request.insert(request.end(), bytes.begin(), bytes.end());
        bool push;
        {
            const std::lock_guard<std::mutex> lock(m_mutex);
            if (m_stop) {
                return;
            }
            push = m_push;
            m_push = false;
        }
        if (push) {
            play(DUMP, false);
        }
        const std::vector<uint8_t> dump = to_bytes(DUMP_REQUEST);
        if (request.size() >= dump.size() &&
            std::equal(dump.begin(), dump.end(), request.begin())) {
            request.erase(request.begin(), request.begin() + static_cast<long>(dump.size()));
            play(DUMP, true);
        }
        DiagFrame frame;
        while (request != to_bytes("3") && DiagFrame::take(request, &frame)) {
            for (const Exchange exchange : {RING_BUFFER, SLEEP_LOG}) {
                if (frame.type == type_of(exchange) && frame.sub_type == 0) {
                    play(exchange, true);
                }
            }
        }
    }
}

void SimDiagResponder::play(Exchange exchange, bool framed) {
    Plan plan;
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        State& state = m_states[exchange];
        ++state.requests;
        state.sent.clear();
        state.content.clear();
        plan = state.plan;
    }
    if (plan.mode == REFUSE && framed) {
        send_frame(exchange, type_of(exchange), SUB_REFUSED, {});
    } else if (plan.mode != NEVER && plan.mode != REFUSE && play_data(exchange, plan, framed)) {
        play_end(exchange, plan, framed);
    }
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        ++m_states[exchange].finished;
    }
    m_changed.notify_all();
}

// The whole of the data, or its first half when the exchange is to fail.
bool SimDiagResponder::play_data(Exchange exchange, const Plan& plan, bool framed) {
    const SimStream content(m_cp, 0xd1a60000u + exchange);
    const bool whole = plan.mode == ANSWER || plan.mode == SLOW;
    const size_t size = whole ? plan.size : plan.size / 2;
    std::vector<uint8_t> piece;
    for (size_t pos = 0; pos < size; pos += piece.size()) {
        piece.resize(std::min(std::max<size_t>(plan.piece, 1), size - pos));
        content.fill(pos, piece.data(), piece.size());
        const bool sent = framed ? send_frame(exchange, type_of(exchange), SUB_DATA, piece)
                                 : send(exchange, piece, true);
        if (!sent) {
            return false;
        }
        if (exchange != DUMP) {
            add_content(exchange, piece);
        }
        // What else is under way between the frames belongs to other exchanges.
        if (exchange != DUMP && pos == 0 &&
            !send_frame(exchange, OTHER_TYPE, SUB_END, to_bytes("not of this exchange"))) {
            return false;
        }
        if (plan.mode == SLOW && !pause(plan.gap_ms)) {
            return false;
        }
    }
    return true;
}

void SimDiagResponder::play_end(Exchange exchange, const Plan& plan, bool framed) {
    if (plan.mode == CUT) {
        return;
    }
    if (!framed) {
        // In a piece of its own: what the service reads together with it is not kept.
        const std::vector<uint8_t> end = to_bytes(CHIP_DUMP_END);
        const auto half = end.begin() + static_cast<long>(end.size() / 2);
        if (!wait_read()) {
            return;
        }
        if (plan.mode != WRONG) {
            send(exchange, end, false);
        } else if (send(exchange, std::vector<uint8_t>(end.begin(), half), true) && wait_read()) {
            send(exchange, std::vector<uint8_t>(half, end.end()), true);
        }
    } else if (exchange == DUMP) {
        // With a byte too many it is not the end.
        send_frame(exchange, DUMP_TYPE, SUB_END,
                   to_bytes(DUMP_END + std::string(plan.mode == WRONG ? "." : "")));
    } else {
        send_frame(exchange, type_of(exchange), plan.mode == WRONG ? SUB_UNEXPECTED : SUB_END, {});
    }
}

bool SimDiagResponder::send(Exchange exchange, const std::vector<uint8_t>& bytes, bool kept) {
    auto next = bytes.begin();
    for (int waited_ms = 0; next != bytes.end();) {
        {
            // Under the lock, so that who knows that the service has it finds it noted here.
            const std::lock_guard<std::mutex> lock(m_mutex);
            State& state = m_states[exchange];
            const size_t n =
                m_device.write_some(&*next, static_cast<size_t>(bytes.end() - next), 0);
            const auto end = next + static_cast<long>(n);
            state.sent.insert(state.sent.end(), next, end);
            if (kept) {
                state.content.insert(state.content.end(), next, end);
            }
            next = end;
            waited_ms = n > 0 ? 0 : waited_ms + 1;
        }
        if (waited_ms >= GIVE_UP_MS || (next != bytes.end() && !pause(1))) {
            m_device.discard();
            return false;
        }
    }
    return true;
}

bool SimDiagResponder::send_frame(Exchange exchange, uint8_t type, uint8_t sub_type,
                                  const std::vector<uint8_t>& payload) {
    DiagFrame frame;
    frame.sequence = m_sequence++;
    frame.type = type;
    frame.sub_type = sub_type;
    frame.payload = payload;
    return send(exchange, frame.encode(), exchange == DUMP);
}

void SimDiagResponder::add_content(Exchange exchange, const std::vector<uint8_t>& bytes) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    State& state = m_states[exchange];
    state.content.insert(state.content.end(), bytes.begin(), bytes.end());
}

// The terminal hands its bytes on in steps: only when it stays empty it is.
bool SimDiagResponder::wait_read() {
    int waited_ms = 0;
    for (int empty_ms = 0; empty_ms < 60; ++waited_ms) {
        empty_ms = m_device.pending() == 0 ? empty_ms + 1 : 0;
        if (waited_ms >= GIVE_UP_MS || !pause(1)) {
            return false;
        }
    }
    return true;
}

bool SimDiagResponder::pause(int ms) {
    std::unique_lock<std::mutex> lock(m_mutex);
    return !m_changed.wait_for(lock, milliseconds(ms), [&] { return m_stop; });
}
