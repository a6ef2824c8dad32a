// SPDX-License-Identifier: Apache-2.0
// The simulated handset without scenes, for authors of control clients: the service runs in it,
// the CPs log, answer requests for ring buffers and sleep logs, and that is all, until somebody
// ends it; on demand the modem crashes. Says where the control socket is.
#ifndef SIM_SERVE_H_
#define SIM_SERVE_H_

#include <signal.h>

#include <chrono>

#include "sim/DemoStage.h"

class Serve {
public:
    // Ends when *interrupted becomes other than 0. At *crash_wanted the modem crashes and it is 0.
    Serve(const DemoOptions& options, const volatile sig_atomic_t* interrupted,
          volatile sig_atomic_t* crash_wanted);

    // The exit status: 0 when it was interrupted, 1 when it could not start or the service
    // ended by itself.
    int run();

private:
    void show_place();
    void feed_audio_dsp();
    void mind_wcn();
    void mind_modem();

    const DemoOptions& m_options;
    const volatile sig_atomic_t* m_interrupted;
    volatile sig_atomic_t* m_crash_wanted;
    DemoStage m_stage;
    const SimStream m_dsp_stream;
    uint64_t m_dsp_fed = 0;
    enum { RUNS, DUMPS, REVIVES } m_crash = RUNS;
    unsigned m_dumps = 0;  // before the crash
    double m_alive_at = 0;
};

#endif  // SIM_SERVE_H_
