// SPDX-License-Identifier: Apache-2.0
// Runs a plan: one process for each life of the service, from start to kill, all on one tree.
#ifndef SIMULATION_RUNNER_H_
#define SIMULATION_RUNNER_H_

#include <string>

#include "simulation/Plan.h"
#include "simulation/State.h"

struct RunResult {
    bool passed = false;
    std::string failure_class;  // of what was found; "crash" when a process died by itself
    std::string failure;
    uint64_t digest = 0;
    Counters counters = {};
    double hours = 0;  // virtual
};

// trace_fd: where the trace goes, or -1.
RunResult run_plan(const Plan& plan, int trace_fd = -1);

// Leaves out every event without which the plan still fails in the same way.
Plan shorten(const Plan& plan, const std::string& failure_class);

#endif  // SIMULATION_RUNNER_H_
