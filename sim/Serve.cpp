// SPDX-License-Identifier: Apache-2.0

#include "sim/Serve.h"

#include <stdio.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <filesystem>

namespace {

using Diag = SimDiagResponder;

const double STEP_S = 0.01;
const uint8_t DSP_STREAM = 0xD0;
const size_t DSP_PIECE = 16 << 10;
// From the last of a dump to the word that the modem is alive: the service is to have read it.
const double REVIVAL_S = 1;
// It is alive again after so long in any case: nobody asks for a dump while its log is off.
const double MAX_CRASH_S = 10;

// The text as one word of a shell.
std::string shell_word(const std::string& text) {
    if (text.find_first_not_of("ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789"
                               "/._-+:@%,") == std::string::npos) {
        return text;
    }
    std::string word = "'";
    for (const char c : text) {
        word += c == '\'' ? std::string("'\\''") : std::string(1, c);
    }
    return word + "'";
}

}  // namespace

Serve::Serve(const DemoOptions& options, const volatile sig_atomic_t* interrupted,
             volatile sig_atomic_t* crash_wanted)
    : m_options(options),
      m_interrupted(interrupted),
      m_crash_wanted(crash_wanted),
      m_stage(options, interrupted),
      m_dsp_stream(DSP_STREAM) {}

int Serve::run() {
    const bool started = m_stage.set_up();
    if (started) {
        // The three places for clients are for others.
        if (m_stage.client().connect(m_stage.handset().root(), SimControlClient::STARTING_MS)) {
            m_stage.client().disconnect();
            show_place();
        }
        Diag::Plan refusal;
        refusal.mode = Diag::REFUSE;  // only the modem keeps a ring buffer and a sleep log
        m_stage.wcn_diag().set_plan(Diag::RING_BUFFER, refusal);
        m_stage.wcn_diag().set_plan(Diag::SLEEP_LOG, refusal);
        while (m_stage.wait(STEP_S)) {
            feed_audio_dsp();
            mind_wcn();
            mind_modem();
        }
        m_stage.clear_line();
        if (!*m_interrupted) {
            fprintf(stderr, "kestsim: the service ended by itself (%s); its last messages:\n%s\n",
                    m_stage.service().status_text().c_str(),
                    m_stage.service().last_log_lines(10).c_str());
        }
    }
    m_stage.service().stop();
    m_stage.take_down();
    const bool good = started && *m_interrupted;
    end_root(m_stage.handset(), m_options, started, good);
    return good ? 0 : 1;
}

void Serve::show_place() {
    const SimHandset& handset = m_stage.handset();
    const std::string root = shell_word(handset.root());
    // Beside this program where they were built with it, else where packages put them.
    const auto tool = [](const char* name) {
        std::error_code ec;
        const auto path =
            std::filesystem::read_symlink("/proc/self/exe", ec).replace_filename(name);
        return access(path.c_str(), X_OK) == 0 ? shell_word(path.string()) : std::string(name);
    };
    const std::string kestctl = tool("kestctl"), kestlog = tool("kestlog");
    const auto& medium = m_stage.logs().media()[handset.sd_inserted() ? 1 : 0];
    printf(
        "The control socket is ready: local stream socket, abstract, \"kestmodem@%s\".\n"
        "    KESTMODEM_ROOT=%s %s status\n"
        "    KESTMODEM_ROOT=%s %s watch\n"
        "    kill -USR1 %d    # the modem crashes\n"
        "    %s ls %s\n"
        "The service's messages are in %s.\n"
        "Ctrl-C ends it.\n\n",
        handset.root().c_str(), root.c_str(), kestctl.c_str(), root.c_str(), kestctl.c_str(),
        static_cast<int>(getpid()), kestlog.c_str(), shell_word(medium.log_root).c_str(),
        handset.path("kestmodem.log").c_str());
    fflush(stdout);
}

void Serve::feed_audio_dsp() {
    // As the others: what the device does not take comes later.
    const double due = m_stage.now() * m_stage.rate_of("agdsp") * 1024;
    uint8_t bytes[DSP_PIECE];
    while (static_cast<double>(m_dsp_fed) < due) {
        const size_t len = static_cast<size_t>(
            std::min(std::ceil(due - static_cast<double>(m_dsp_fed)), double{DSP_PIECE}));
        m_dsp_stream.fill(m_dsp_fed, bytes, len);
        const ssize_t taken = m_stage.handset().audio_dsp().log().feed(bytes, len);
        if (taken <= 0) {
            break;
        }
        m_dsp_fed += static_cast<uint64_t>(taken);
    }
}

// The chip's log and its answers come through one device: the log waits for them.
void Serve::mind_wcn() {
    const Diag& diag = m_stage.wcn_diag();
    m_stage.wcn().running = diag.requests(Diag::RING_BUFFER) == diag.finished(Diag::RING_BUFFER) &&
                            diag.requests(Diag::SLEEP_LOG) == diag.finished(Diag::SLEEP_LOG);
}

// One crash at a time: its memory is asked for, then it is alive and logs again.
void Serve::mind_modem() {
    const unsigned dumps = m_stage.modem_diag().finished(Diag::DUMP);
    if (m_crash == RUNS && *m_crash_wanted && m_stage.modem_supervisor().connected()) {
        *m_crash_wanted = 0;
        m_crash = DUMPS;
        m_dumps = dumps;
        m_alive_at = m_stage.now() + MAX_CRASH_S;
        m_stage.modem().running = false;
        m_stage.say("the modem crashes");
        m_stage.modem_supervisor().send("Modem Assert: simulated");
    } else if (m_crash == DUMPS && (dumps > m_dumps || m_stage.now() >= m_alive_at)) {
        m_crash = REVIVES;
        m_alive_at = m_stage.now() + REVIVAL_S;
    } else if (m_crash == REVIVES && m_stage.now() >= m_alive_at) {
        m_crash = RUNS;
        m_stage.say("the modem is alive");
        m_stage.modem_supervisor().send("Modem Alive");
        m_stage.modem().running = true;
    }
}
