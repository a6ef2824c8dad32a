// SPDX-License-Identifier: Apache-2.0
// The service's loop, driven step by step by a test.
#ifndef TESTS_SUPPORT_LOOP_H_
#define TESTS_SUPPORT_LOOP_H_

#include <memory>

#include "core/FdHandler.h"
#include "core/Multiplexer.h"
#include "support/TestRoot.h"

// One pass of the loop that ends after about 20 ms even when nothing happens.
inline void pump_once(Multiplexer& mux) {
    bool fired = false;
    TimerManager::Timer* guard = mux.timer_mgr().create_timer(
        20, [](void* flag) { *static_cast<bool*>(flag) = true; }, &fired);
    mux.run_once();
    if (!fired) {
        mux.timer_mgr().del_timer(guard);
    }
}

// Runs the loop until the condition holds; false when the time is over.
inline bool pump_until(Multiplexer& mux, const std::function<bool()>& condition) {
    return wait_until(condition, 60000, [&] { pump_once(mux); });
}

// Fills the loop's table, or sees how many handlers it still takes.
class Filler : public FdHandler {
public:
    explicit Filler(Multiplexer* mux) : FdHandler(-1, nullptr, mux) {}
    void process(int) override {}

    static std::vector<std::unique_ptr<Filler>> fill(Multiplexer& mux) {
        std::vector<std::unique_ptr<Filler>> fillers;
        for (;;) {
            auto filler = std::make_unique<Filler>(&mux);
            if (filler->add_events(POLLIN) < 0) {
                return fillers;
            }
            fillers.push_back(std::move(filler));
        }
    }
    static size_t free_slots(Multiplexer& mux) { return fill(mux).size(); }
};

#endif  // TESTS_SUPPORT_LOOP_H_
