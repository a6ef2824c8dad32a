// SPDX-License-Identifier: Apache-2.0
// The handset that the service is started for: a GNSS receiver, and supervisors to connect
// to, without which the service would try again every few seconds.
#ifndef BENCH_BENCHHANDSET_H_
#define BENCH_BENCHHANDSET_H_

#include <stdint.h>

#include <string>
#include <vector>

#include "sim/ServiceProcess.h"
#include "sim/SimHandset.h"
#include "sim/SimSupervisor.h"

class BenchHandset {
public:
    // Its root is dir/h; the quota is kept_mib, 0 for none. Says what fails.
    BenchHandset(const std::string& dir, uint64_t kept_mib);
    ~BenchHandset() { m_sim.remove_root(); }
    BenchHandset(const BenchHandset&) = delete;
    BenchHandset& operator=(const BenchHandset&) = delete;

    bool ok() const { return m_ok; }
    const SimHandset& sim() const { return m_sim; }
    const std::string& fifo() const { return m_fifo; }

    // True when the log files hold what they must after size bytes: all but what may
    // still be staged in the service, or what the quota allows.
    bool check_logs(uint64_t size) const;

private:
    SimHandset m_sim;
    SimSupervisor m_modemd;
    SimSupervisor m_wcnd;
    std::string m_fifo;
    const uint64_t m_kept_mib;
    bool m_ok = false;
};

// Starts the service, or a wrapper of it, for the handset; the writing end of the GNSS
// receiver's log device, or -1.
int start_service(const std::vector<std::string>& args, const BenchHandset& handset,
                  ServiceProcess& service);

#endif  // BENCH_BENCHHANDSET_H_
