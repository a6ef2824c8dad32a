// SPDX-License-Identifier: Apache-2.0
// The service under measurement and its handset: co-processors, supervisors to connect to
// (without which the service would try again every few seconds) and the writing end of the
// first log device. Ends the service and removes the handset's root at its end.
#ifndef BENCH_BENCHSERVICE_H_
#define BENCH_BENCHSERVICE_H_

#include <stddef.h>
#include <stdint.h>

#include <string>
#include <vector>

#include "bench/Options.h"
#include "bench/common.h"
#include "sim/ServiceProcess.h"
#include "sim/SimControlClient.h"
#include "sim/SimHandset.h"
#include "sim/SimSupervisor.h"

class BenchService {
public:
    struct Setup {
        std::vector<std::string> cps = {"cp_gnss"};  // its files begin with no time record
        unsigned quota_mib = KEPT_MIB;               // 0: none
        bool audio_dsp = false;
        bool iq_memory = false;
    };

    // Makes the handset below dir, with no logs yet. Says what fails.
    BenchService(const Options& options, const std::string& dir, const Setup& setup);
    BenchService(const Options& options, const std::string& dir)
        : BenchService(options, dir, Setup()) {}
    ~BenchService();
    BenchService(const BenchService&) = delete;
    BenchService& operator=(const BenchService&) = delete;

    // Starts it, also below a wrapper, and waits until it has opened the first log device.
    bool start(const std::vector<std::string>& wrapper = {});
    // Waits until it no longer watches whether its supervisors' connections last, which takes a
    // timer and so a look at the clock in each pass.
    void wait_steady() const;
    // Kills it: true when that is what it ended by. Its cost() is known then.
    bool kill();

    // Writes to the first log device; waits for room.
    bool feed(uint64_t size, size_t block);
    // Waits until everything was read from it, and then until the service rests.
    bool settle();
    // Sends a request; says so when the reply is another one.
    bool request(const std::string& line, const std::string& reply = "OK");
    bool connect();
    // Has the I/Q samples of the modem cp_wcdma saved from now on.
    bool enable_iq();

    double cpu() const;  // seconds since its start, of all threads
    // True when the log files hold what they must after size bytes: all but what may still be
    // staged in the service, or what the quota allows.
    bool check_logs(uint64_t size) const;

    SimHandset& handset() { return m_handset; }
    ServiceProcess& process() { return m_process; }
    SimControlClient& client() { return m_client; }
    int log_device() const { return m_log_device; }
    std::string log_root() const { return m_handset.path("data/modem_log"); }

private:
    const std::string m_program;
    const Setup m_setup;
    SimHandset m_handset;
    SimSupervisor m_modemd;
    SimSupervisor m_wcnd;
    ServiceProcess m_process;
    SimControlClient m_client;
    int m_log_device = -1;
    double m_started = 0;
    bool m_made = false;
};

#endif  // BENCH_BENCHSERVICE_H_
