// SPDX-License-Identifier: Apache-2.0

#include "bench/BenchService.h"

#include <signal.h>
#include <stdio.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>

#include "bench/feeding.h"
#include "bench/process_figures.h"
#include "sim/LogCollector.h"

namespace {

constexpr double STEADY_S = 6.5;

}  // namespace

BenchService::BenchService(const Options& options, const std::string& dir, const Setup& setup)
    : m_program(options.service), m_setup(setup) {
    m_made = m_handset.create(dir + "/h", {FILE_MIB, setup.quota_mib, 250, true});
    for (const std::string& cp : setup.cps) {
        m_made = m_made && m_handset.add_cp(cp);
    }
    m_made = m_made && (!setup.audio_dsp || m_handset.add_audio_dsp()) &&
             (!setup.iq_memory || m_handset.add_iq_memory());
    if (!m_made) {
        fprintf(stderr, "bench: %s\n", m_handset.error().c_str());
        return;
    }
    m_handset.cps()[0]->log.leave_to_writer();
    m_made = (m_modemd.start("modemd", m_handset.root()) &&
              m_wcnd.start("external_wcn_kest", m_handset.root())) ||
             fail("listen in", m_handset.root());
}

BenchService::~BenchService() {
    m_process.stop();
    if (m_log_device >= 0) {
        close(m_log_device);
    }
    m_handset.remove_root();
}

bool BenchService::start(const std::vector<std::string>& wrapper) {
    std::vector<std::string> args = wrapper;
    args.push_back(m_program);
    if (!m_made) {
        return false;
    }
    if (!m_process.start(args[0], m_handset, {args.begin() + 1, args.end()})) {
        return fail("start", args[0]);
    }
    m_started = now();
    m_log_device = open_writer(m_handset.cps()[0]->log.path(), m_process);
    if (m_log_device < 0) {
        fputs(m_process.log_text().c_str(), stderr);
    }
    return m_log_device >= 0;
}

void BenchService::wait_steady() const {
    while (now() - m_started < STEADY_S && !g_interrupted) {
        sleep_ms(100);
    }
}

bool BenchService::kill() {
    m_process.signal(SIGKILL);
    return m_process.wait() && WIFSIGNALED(m_process.status()) &&
           WTERMSIG(m_process.status()) == SIGKILL;
}

bool BenchService::feed(uint64_t size, size_t block) {
    return ::feed(m_log_device, size, block, [](uint64_t) {});
}

bool BenchService::settle() {
    if (!wait_empty(m_log_device, m_process)) {
        return false;
    }
    wait_idle(m_process, 20);
    return true;
}

bool BenchService::connect() {
    return m_client.connected() || m_client.connect(m_handset.root(), START_TIMEOUT_MS) ||
           fail("connect to the service in", m_handset.root());
}

bool BenchService::request(const std::string& line, const std::string& reply) {
    if (!connect()) {
        return false;
    }
    const std::string answer = m_client.request(line, START_TIMEOUT_MS);
    if (answer != reply) {
        fprintf(stderr, "bench: the reply to %s is \"%s\"\n", line.c_str(), answer.c_str());
    }
    return answer == reply;
}

bool BenchService::enable_iq() {
    // The capture begins with the log.
    if (!request("ENABLE_IQ WCDMA WCDMA") || !request("DISABLE_LOG WCDMA") ||
        !request("ENABLE_LOG WCDMA")) {
        return false;
    }
    for (int waited = 0; !m_handset.iq_memory().in_use(); ++waited) {
        if (waited >= START_TIMEOUT_MS) {
            return fail("start the capture in", m_handset.root());
        }
        sleep_ms(1);
    }
    return true;
}

double BenchService::cpu() const {
    return process_cpu(m_process.pid());
}

bool BenchService::check_logs(uint64_t size) const {
    constexpr uint64_t STAGED = 65536;
    LogCollector logs(m_handset);
    logs.scan();
    const uint64_t found = logs.media()[0].bytes;
    const uint64_t quota = m_setup.quota_mib ? m_setup.quota_mib * MIB : size;
    const uint64_t most = std::min(quota, size);
    const uint64_t tolerance = size > quota ? (FILE_MIB + 1) * MIB : 0;
    if (found > most || found + STAGED + tolerance < most) {
        fprintf(stderr, "bench: the log files hold %llu bytes, not about %llu\n",
                static_cast<unsigned long long>(found), static_cast<unsigned long long>(most));
        return false;
    }
    return true;
}
