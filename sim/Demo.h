// SPDX-License-Identifier: Apache-2.0
// The demo: one run of the service on a simulated handset with three CPs, with scenes of
// what can happen to it, shown while it goes on and checked at the end.
#ifndef SIM_DEMO_H_
#define SIM_DEMO_H_

#include <signal.h>

#include "sim/DemoStage.h"

class Demo {
public:
    // Ends early when *interrupted becomes other than 0.
    Demo(const DemoOptions& options, const volatile sig_atomic_t* interrupted);

    // The exit status: 0 when every check of every scene passed and nothing of the logs was
    // lost or doubled, 1 otherwise, also when the service ended by itself.
    int run();

private:
    void show_plan();
    void play();
    bool finish();
    bool read_logs();
    bool write_report();
    bool show_verdict();

    const DemoOptions m_options;
    const volatile sig_atomic_t* m_interrupted;
    DemoStage m_stage;
};

#endif  // SIM_DEMO_H_
