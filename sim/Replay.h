// SPDX-License-Identifier: Apache-2.0
// A recorded card, played once more: what its log files hold goes into the devices of a
// simulated handset at the recorded or another speed, and what the service writes is compared
// with the recording, byte for byte.
#ifndef SIM_REPLAY_H_
#define SIM_REPLAY_H_

#include <signal.h>

#include <memory>
#include <string>
#include <vector>

#include "sim/DemoStage.h"
#include "sim/RecordedCard.h"
#include "sim/ReplayFeeder.h"
#include "sim/ReplaySchedule.h"

class Replay {
public:
    enum Status { EQUAL = 0, DIFFERENT = 1, EQUAL_IN_PART = 3 };

    // Of the options those about the programs, the root and the SD card count. Ends early when
    // *interrupted becomes other than 0.
    Replay(const DemoOptions& options, const volatile sig_atomic_t* interrupted);

    // The exit status: EQUAL_IN_PART when what could be fed came out equal, but something of
    // the recording could not be fed.
    int run();

private:
    struct Cp {
        const RecordedCp& recorded;
        ReplaySchedule schedule;
        std::unique_ptr<ReplayFeeder> feeder;
    };

    bool set_up();
    bool play();
    bool feed(double time, bool* done);
    bool finish();
    bool compare();
    void show_recording() const;
    void show_progress(double time);
    void clear_line() const;
    void show_problem(const std::string& line);
    bool fail(const std::string& text) const;

    const DemoOptions& m_options;
    const volatile sig_atomic_t* m_interrupted;
    RecordedCard m_card;
    SimHandset m_handset;
    ServiceProcess m_service;
    SimSupervisor m_modem_supervisor;
    SimSupervisor m_wcn_supervisor;
    SimControlClient m_client;
    std::vector<Cp> m_cps;
    unsigned m_problems = 0;
    const bool m_tty;
    int64_t m_shown = 0;  // second of the steady clock
};

#endif  // SIM_REPLAY_H_
