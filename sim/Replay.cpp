// SPDX-License-Identifier: Apache-2.0

#include "sim/Replay.h"

#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <limits>

#include "sim/files.h"

namespace {

const uint64_t MB = 1 << 20;
const int STEP_US = 1000;
// The service takes no byte for so long, with something there to be taken.
const double PATIENCE_S = 60;
// Pauses of the whole handset that are longer than this are left out.
const double LONGEST_PAUSE_S = 5;

double now_s() {
    return std::chrono::duration<double>(std::chrono::steady_clock::now().time_since_epoch())
        .count();
}

std::string time_text(double seconds) {
    const time_t t = static_cast<time_t>(seconds);
    tm parts;
    char text[32] = "?";
    if (gmtime_r(&t, &parts)) {
        strftime(text, sizeof text, "%Y-%m-%d %H:%M:%S", &parts);
    }
    return text;
}

}  // namespace

Replay::Replay(const DemoOptions& options, const volatile sig_atomic_t* interrupted)
    : m_options(options), m_interrupted(interrupted), m_tty(isatty(STDOUT_FILENO) != 0) {}

bool Replay::fail(const std::string& text) const {
    fprintf(stderr, "kestsim: %s\n", text.c_str());
    return false;
}

void Replay::show_problem(const std::string& line) {
    fail(line);
    ++m_problems;
}

int Replay::run() {
    const bool recorded = m_card.read(m_options.replay);
    for (const std::string& problem : m_card.problems()) {
        show_problem(problem);
    }
    if (!recorded) {
        return DIFFERENT;
    }
    show_recording();
    const bool started = set_up();
    const bool played = started && play();
    const bool written = started && finish();
    m_client.disconnect();
    m_service.stop();
    const bool equal = started && compare() && played && written;
    end_root(m_handset, m_options, started, equal || *m_interrupted);
    return !equal ? DIFFERENT : m_problems > 0 ? EQUAL_IN_PART : EQUAL;
}

void Replay::show_recording() const {
    printf("Recorded in %s: %zu sets", m_options.replay.c_str(), m_card.sets());
    if (m_card.other_files() > 0) {
        printf("; %u files beside the log files are not fed", m_card.other_files());
    }
    printf("\n");
    for (const RecordedCp& cp : m_card.cps()) {
        printf("    %-12s %12llu bytes in %zu log files, from %s to %s\n", cp.name.c_str(),
               static_cast<unsigned long long>(cp.size()), cp.files.size(),
               time_text(static_cast<double>(cp.files.front().time)).c_str(),
               time_text(static_cast<double>(cp.files.back().time)).c_str());
    }
}

bool Replay::set_up() {
    // Files as large as the recorded ones, and no quota: nothing may be deleted.
    uint64_t bytes = 0;
    uint64_t largest = 0;
    for (const RecordedCp& cp : m_card.cps()) {
        bytes += cp.size();
        for (const RecordedFile& file : cp.files) {
            largest = std::max(largest, file.size);
        }
    }
    SimSizes sizes;
    sizes.log_file = static_cast<unsigned>(std::clamp<uint64_t>(largest / MB, 1, 4095));
    sizes.data = sizes.sd = 0;
    std::string problem;
    // Chunks of the audio DSP may become smaller than they were; each has a header.
    if (!has_room(m_options.root, bytes + bytes / 10 + 20 * MB, &problem)) {
        return fail(problem);
    }
    if (!m_handset.create(m_options.root, sizes) || (m_options.card_in && !m_handset.insert_sd())) {
        return fail(m_handset.error());
    }
    const std::string& root = m_handset.root();
    printf("Simulated handset: %s\n", root.c_str());
    for (const RecordedCp& cp : m_card.cps()) {
        m_cps.push_back({cp, ReplaySchedule(cp), ReplayFeeder::make(m_handset, cp)});
        if (!m_cps.back().feeder) {
            return fail(m_handset.error());
        }
    }
    if (!m_modem_supervisor.start("modemd", root) ||
        !m_wcn_supervisor.start("external_wcn_kest", root)) {
        return fail("cannot set up " + root + ": " + strerror(errno));
    }
    if (!m_service.start(m_options.program, m_handset)) {
        return fail("cannot run " + m_options.program + ": " + strerror(errno));
    }
    return m_client.connect(root, SimControlClient::STARTING_MS) ||
           fail("the service does not answer; its last messages:\n" + m_service.last_log_lines(10));
}

// Feeds what is due. True when something was done; *done when nothing is left.
bool Replay::feed(double time, bool* done) {
    bool fed = false;
    *done = true;
    for (const Cp& cp : m_cps) {
        fed = cp.feeder->feed(cp.schedule.due(time)) || fed;
        *done = *done && cp.feeder->done() && cp.feeder->taken();
    }
    return fed;
}

bool Replay::play() {
    const double speed = m_options.speed;
    double played = std::numeric_limits<double>::infinity();  // up to this recorded time
    if (speed > 0) {
        for (const Cp& cp : m_cps) {
            played = std::min(played, cp.schedule.file_start(0));
        }
        printf("Feeding at %g times the recorded speed; Ctrl-C ends it earlier.\n", speed);
    } else {
        printf("Feeding as fast as the service takes it; Ctrl-C ends it earlier.\n");
    }
    fflush(stdout);
    double last = now_s();
    double progress = last;
    for (bool done = false; !*m_interrupted;) {
        const bool fed = feed(played, &done);
        if (done) {
            return true;
        }
        if (!m_service.alive()) {
            return fail("the service ended by itself (" + m_service.status_text() +
                        "); its last messages:\n" + m_service.last_log_lines(10));
        }
        const double now = now_s();
        if (std::isfinite(played)) {
            played += (now - last) * speed;
        }
        last = now;
        double next = std::numeric_limits<double>::infinity();
        bool idle = true;
        for (const Cp& cp : m_cps) {
            const uint64_t position = cp.feeder->position();
            idle = idle && cp.feeder->taken() && position >= cp.schedule.due(played);
            next = std::min(next, cp.schedule.file_start(position));
        }
        if (fed || idle) {
            progress = now;
        }
        if (std::isfinite(next) && next > played + LONGEST_PAUSE_S * std::max(1.0, speed)) {
            clear_line();
            printf("Nothing was logged from %s to %s: left out\n", time_text(played).c_str(),
                   time_text(next).c_str());
            played = next;
        }
        if (now - progress > PATIENCE_S) {
            return fail("the service has taken nothing for a minute; its last messages:\n" +
                        m_service.last_log_lines(10));
        }
        show_progress(played);
        if (!fed) {
            usleep(STEP_US);
        }
    }
    return fail("interrupted: ending early");
}

// On a terminal, once a second.
void Replay::show_progress(double time) {
    const auto second = static_cast<int64_t>(now_s());
    if (!m_tty || second == m_shown) {
        return;
    }
    m_shown = second;
    uint64_t fed = 0;
    uint64_t all = 0;
    for (const Cp& cp : m_cps) {
        fed += cp.feeder->position();
        all += cp.recorded.size();
    }
    clear_line();
    printf("%s  %.1f of %.1f MB", std::isfinite(time) ? time_text(time).c_str() : "",
           static_cast<double>(fed) / MB, static_cast<double>(all) / MB);
    fflush(stdout);
}

void Replay::clear_line() const {
    if (m_tty) {
        fputs("\r\033[K", stdout);
    }
}

// What the service has read it also writes before it answers.
bool Replay::finish() {
    clear_line();
    const double deadline = now_s() + PATIENCE_S;
    while (
        m_service.alive() && now_s() < deadline &&
        !std::all_of(m_cps.begin(), m_cps.end(), [](const Cp& cp) { return cp.feeder->taken(); })) {
        usleep(STEP_US);
    }
    return m_client.request("FLUSH", static_cast<int>(PATIENCE_S) * 1000) == "OK" ||
           fail("the service does not answer FLUSH with OK");
}

bool Replay::compare() {
    RecordedCard written;
    written.read(m_handset.root(), true);
    printf("What the service wrote, against what it was fed:\n");
    bool equal = true;
    for (const Cp& cp : m_cps) {
        for (const std::string& problem : cp.feeder->problems()) {
            show_problem(problem);
        }
        const auto found =
            std::find_if(written.cps().begin(), written.cps().end(),
                         [&](const RecordedCp& c) { return c.name == cp.recorded.name; });
        std::vector<std::string> lines;
        equal =
            cp.feeder->compare(found == written.cps().end() ? nullptr : &*found, &lines) && equal;
        for (const std::string& line : lines) {
            printf("    %s\n", line.c_str());
        }
    }
    return equal;
}
