// SPDX-License-Identifier: Apache-2.0
// What the runner and the library that it preloads into the service share, in a mapped file:
// which call is to fail, and what was seen of the service's calls.
#ifndef SIM_FAULTPLAN_H_
#define SIM_FAULTPLAN_H_

#include <atomic>

#include "sim/calls.h"

// The environment variable with the file's path.
#define FAULT_PLAN_VARIABLE "KEST_FAULT_PLAN"

// The service's timers and time-outs run so many times faster than the machine's clock.
constexpr int FAULT_CLOCK_SPEED = 20;

// In place of an errno: the call transfers half of what it was asked for.
constexpr int CUT_SHORT = -1;

struct FaultPlan {
    std::atomic<int> process;  // the service; 0: the next one that starts
    std::atomic<int> call;     // a faults::Call
    std::atomic<int> error;    // errno, or CUT_SHORT
    std::atomic<int> first;    // that fails, counted from 1
    std::atomic<int> last;     // 0: none fails any more
    std::atomic<int> calls;    // of this kind so far
    std::atomic<int> failed;
    std::atomic<int> idle_passes;  // the most polls in a row that came to nothing
};

#endif  // SIM_FAULTPLAN_H_
