// SPDX-License-Identifier: Apache-2.0

#include "bench/BenchHandset.h"

#include <stdio.h>

#include <algorithm>

#include "bench/common.h"
#include "bench/feeding.h"
#include "sim/LogCollector.h"

BenchHandset::BenchHandset(const std::string& dir, uint64_t kept_mib) : m_kept_mib(kept_mib) {
    const SimSizes sizes = {FILE_MIB, static_cast<unsigned>(kept_mib), 250, true};
    SimCp* gnss = m_sim.create(dir + "/h", sizes) ? m_sim.add_cp("cp_gnss") : nullptr;
    if (!gnss) {
        fprintf(stderr, "bench_log_path: %s\n", m_sim.error().c_str());
        return;
    }
    gnss->log.leave_to_writer();
    m_fifo = gnss->log.path();
    m_ok = (m_modemd.start("modemd", m_sim.root()) &&
            m_wcnd.start("external_wcn_kest", m_sim.root())) ||
           fail("listen in", m_sim.root());
}

bool BenchHandset::check_logs(uint64_t size) const {
    constexpr uint64_t STAGED = 65536;
    LogCollector logs(m_sim);
    logs.scan();
    const uint64_t found = logs.media()[0].bytes;
    const uint64_t quota = m_kept_mib ? m_kept_mib * MIB : size;
    const uint64_t most = std::min(quota, size);
    const uint64_t tolerance = size > quota ? (FILE_MIB + 1) * MIB : 0;
    if (found > most || found + STAGED + tolerance < most) {
        fprintf(stderr, "bench_log_path: the log files hold %llu bytes, not about %llu\n",
                static_cast<unsigned long long>(found), static_cast<unsigned long long>(most));
        return false;
    }
    return true;
}

int start_service(const std::vector<std::string>& args, const BenchHandset& handset,
                  ServiceProcess& service) {
    if (!handset.ok()) {
        return -1;
    }
    if (!service.start(args[0], handset.sim(), {args.begin() + 1, args.end()})) {
        fail("start", args[0]);
        return -1;
    }
    const int fd = open_writer(handset.fifo(), service);
    if (fd < 0) {
        fputs(service.log_text().c_str(), stderr);
    }
    return fd;
}
