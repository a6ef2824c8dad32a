// SPDX-License-Identifier: Apache-2.0

#include "sim/DemoStage.h"

#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <future>

#include "sim/files.h"
#include "sim/kernel_files.h"

namespace fs = std::filesystem;

namespace {

// Bytes fed at a time to a CP, and to all of them between two looks at the logs: well
// below the size of a log file.
const double FEED_STEP = 128 << 10;
const uint64_t WATCH_STEP = 512 << 10;

const unsigned LIFTED_QUOTA = 2000;  // MB

double to_mb(uint64_t bytes) {
    return static_cast<double>(bytes) / (1 << 20);
}

bool begins_with(const std::string& text, const std::string& start) {
    return text.compare(0, start.size(), start) == 0;
}

bool ends_with(const std::string& text, const std::string& end) {
    return text.size() >= end.size() &&
           text.compare(text.size() - end.size(), end.size(), end) == 0;
}

}  // namespace

void end_root(SimHandset& handset, const DemoOptions& options, bool started, bool good) {
    if (handset.root().empty()) {
        return;
    }
    // A root that this program made and never used is of no use to anybody; where a check
    // failed there is something to look for.
    if (options.keep || !options.root.empty() || (started && !good)) {
        printf("Everything is in %s (remove it when done).\n", handset.root().c_str());
        return;
    }
    if (!handset.remove_root()) {
        printf("%s could not be removed.\n", handset.root().c_str());
    } else if (started) {
        printf("%s was removed; --keep keeps it.\n", handset.root().c_str());
    }
}

DemoStage::DemoStage(const DemoOptions& options, const volatile sig_atomic_t* interrupted)
    : m_options(options),
      m_interrupted(interrupted),
      m_modem_image(300000, 1),
      m_rate(options.rate),
      m_tty(isatty(STDOUT_FILENO) != 0),
      m_start(std::chrono::steady_clock::now()) {}

bool DemoStage::fail(const std::string& text) {
    fprintf(stderr, "kestsim: %s\n", text.c_str());
    return false;
}

// The largest I/Q buffer is there twice, in the device and in a file; beside it the logs
// within their quotas, the dumps, and what is fed while the quotas are lifted.
bool DemoStage::has_room() {
    const uint64_t needed = (uint64_t{380} << 20) + uint64_t{m_options.rate} * 1024 * 30;
    std::string problem;
    return ::has_room(m_options.root, needed, &problem) || fail(problem);
}

bool DemoStage::set_up() {
    if (!has_room()) {
        return false;
    }
    if (!m_handset.create(m_options.root)) {
        return fail(m_handset.error());
    }
    printf("Simulated handset: %s\n", m_handset.root().c_str());
    for (const char* name : {"cp_wcdma", "cp_wcn", "cp_gnss"}) {
        // The WCN chip's memory comes through its log device.
        if (!m_handset.add_cp(name, strcmp(name, "cp_wcn") == 0)) {
            return fail(m_handset.error());
        }
    }
    if (!m_handset.add_audio_dsp() || !m_handset.add_iq_memory() ||
        (m_options.serve && m_options.card_in && !m_handset.insert_sd())) {
        return fail(m_handset.error());
    }
    const std::string& root = m_handset.root();
    if (!m_modem_image.install(m_handset, "w") || !make_kernel_files(root) ||
        !m_modem_supervisor.start("modemd", root) ||
        !m_wcn_supervisor.start("external_wcn_kest", root)) {
        return fail("cannot set up " + root + ": " + strerror(errno));
    }
    m_due.assign(m_handset.cps().size(), 0);
    m_modem_diag = std::make_unique<SimDiagResponder>(modem().diag, uint8_t{1});
    m_wcn_diag = std::make_unique<SimDiagResponder>(*wcn().log.terminal(), uint8_t{2});
    m_modem_diag->start();
    m_wcn_diag->start();
    m_logs = std::make_unique<LogCollector>(m_handset);
    if (!m_service.start(m_options.program, m_handset)) {
        return fail("cannot run " + m_options.program + ": " + strerror(errno));
    }
    m_start = std::chrono::steady_clock::now();
    return true;
}

void DemoStage::take_down() {
    m_client.disconnect();
    m_modem_supervisor.stop();
    m_wcn_supervisor.stop();
    for (auto* diag : {m_modem_diag.get(), m_wcn_diag.get()}) {
        if (diag) {
            diag->stop();
        }
    }
    m_handset.time_service().stop();
}

unsigned DemoStage::rate_of(const std::string& cp_name) const {
    const auto own = m_options.rates.find(cp_name);
    return own == m_options.rates.end() ? m_rate : own->second;
}

bool DemoStage::over() {
    return *m_interrupted || !m_service.alive();
}

bool DemoStage::run_until(double seconds) {
    while (!over()) {
        if (m_now >= seconds) {
            return true;
        }
        step();
    }
    return false;
}

bool DemoStage::wait_until(const std::function<bool()>& condition, double seconds) {
    // Nobody watches a fast one, and the machine may be busy with others.
    const double deadline = m_now + (m_options.fast ? 10 : 1) * seconds;
    while (!condition()) {
        if (over() || m_now >= deadline) {
            return false;
        }
        step();
    }
    return true;
}

bool DemoStage::wait_for(const std::function<void()>& work) {
    const std::future<void> done = std::async(std::launch::async, work);
    return wait_until(
        [&] { return done.wait_for(std::chrono::seconds(0)) == std::future_status::ready; }, 60);
}

void DemoStage::step() {
    usleep(5000);
    const double before = m_now;
    m_now = std::chrono::duration<double>(std::chrono::steady_clock::now() - m_start).count();
    feed(m_now - before);
    if (m_now >= m_next_watch || m_unwatched >= WATCH_STEP) {
        watch();
        m_next_watch = m_now + 0.05;
    }
    if (m_now >= m_next_line) {
        if (m_tty || !m_options.serve) {
            show_progress();
        }
        m_next_line += 1;
    }
}

// A device that is full takes the rest later: nothing is dropped on this side.
void DemoStage::feed(double seconds) {
    for (size_t i = 0; i < m_due.size(); ++i) {
        SimCp& cp = *m_handset.cps()[i];
        if (cp.running) {
            m_due[i] += seconds * rate_of(cp.name) * 1024;
            const uint64_t fed = cp.feed(static_cast<size_t>(std::min(m_due[i], FEED_STEP)));
            m_due[i] -= static_cast<double>(fed);
            m_unwatched += fed;
        }
    }
}

// Looks at the logs and tells what is new.
void DemoStage::watch() {
    m_logs->scan();
    m_unwatched = 0;
    const LogCollector::Medium* medium = m_logs->in_use();
    if (medium && medium->name != m_medium) {
        m_medium = medium->name;
        say("logs now go to: " + m_medium);
    }
    if (m_logs->trimmed_files() > 0 && !m_trimming) {
        m_trimming = true;
        say("quota reached: the service deletes its oldest files");
    }
}

void DemoStage::clear_line() {
    if (m_tty) {
        fputs("\r\033[K", stdout);
    }
}

void DemoStage::say(const std::string& text) {
    clear_line();
    printf("%5.1f s  %s\n", m_now, text.c_str());
    fflush(stdout);
}

bool DemoStage::check(bool good, const std::string& text) {
    if (good) {
        ++m_passed;
        say("  ok: " + text);
    } else if (!over()) {
        m_failures.push_back(text);
        say("  FAILED: " + text);
    }
    return good;
}

void DemoStage::show_progress() {
    uint64_t in = 0;
    uint64_t on_media = 0;
    unsigned file_count = 0;
    unsigned sets = 0;
    char quota[128] = "";
    char line[256];
    for (const auto& cp : m_handset.cps()) {
        in += cp->fed;
    }
    for (const LogCollector::Medium& m : m_logs->media()) {
        on_media += m.bytes;
        file_count += m.files;
        sets += m.sets;
        const bool in_use = m.name == m_medium;
        const size_t at = strlen(quota);
        snprintf(quota + at, sizeof quota - at, "  %s%s %.1f/%.0f%s", in_use ? "[" : "",
                 m.name.c_str(), to_mb(m.bytes), to_mb(m.quota), in_use ? "]" : "");
    }
    snprintf(line, sizeof line, "%5.1f s  in %.1f  disk %.1f  %u sets  %u files%s  (%u trimmed)",
             m_now, to_mb(in), to_mb(on_media), sets, file_count, quota, m_logs->trimmed_files());
    // A line that wraps could not be rewritten.
    winsize size;
    if (m_tty && ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) == 0 && size.ws_col > 1 &&
        size.ws_col <= strlen(line)) {
        line[size.ws_col - 1] = '\0';
    }
    clear_line();
    printf("%s%s", line, m_tty ? "" : "\n");
    fflush(stdout);
}

std::string DemoStage::request(const std::string& line, double timeout_s) {
    std::string reply;
    const bool sent = m_client.send(line);
    if (sent) {
        wait_until([&] { return m_client.reply(&reply) || !m_client.connected(); }, timeout_s);
    }
    say(line + "  ->  " + (reply.empty() ? "(no reply)" : reply));
    return reply;
}

bool DemoStage::expect(const std::string& line, const std::string& reply, double timeout_s) {
    if (request(line, timeout_s) == reply) {
        ++m_passed;
        return true;
    }
    return check(false, line + " was to be answered " + reply);
}

bool DemoStage::set_quotas(bool hold) {
    const SimSizes& sizes = m_handset.sizes();
    const std::string data = std::to_string(hold ? sizes.data : LIFTED_QUOTA);
    const std::string sd = std::to_string(hold ? sizes.sd : LIFTED_QUOTA);
    return expect("SET_DATA_MAX_SIZE " + data, "OK") && expect("SET_SD_MAX_SIZE " + sd, "OK");
}

bool DemoStage::expect_notification(const std::string& line, double timeout_s) {
    std::string notified;
    if (wait_until([&] { return m_client.notification(&notified); }, timeout_s)) {
        say("the client receives: " + notified);
    }
    if (notified == line) {
        ++m_passed;
        return true;
    }
    return check(false, "the client was to receive " + line);
}

std::vector<std::string> DemoStage::cp_files(const std::string& cp_name, const std::string& prefix,
                                             const std::string& suffix) const {
    std::vector<std::string> found;
    std::error_code ec;
    for (const LogCollector::Medium& medium : m_logs->media()) {
        for (fs::directory_iterator set(medium.log_root, ec), end; !ec && set != end;
             set.increment(ec)) {
            std::error_code none;
            for (fs::directory_iterator file(set->path() / cp_name, none), last;
                 !none && file != last; file.increment(none)) {
                const std::string name = file->path().filename().string();
                if (begins_with(name, prefix) && ends_with(name, suffix)) {
                    found.push_back(file->path().string());
                }
            }
        }
    }
    std::sort(found.begin(), found.end());
    return found;
}

bool DemoStage::check_new_file(const SimCp& cp, const std::string& prefix,
                               const std::string& suffix, const std::vector<std::string>& earlier,
                               const std::vector<uint8_t>& content) {
    std::vector<std::string> fresh;
    for (const std::string& path : files(cp, prefix, suffix)) {
        if (std::find(earlier.begin(), earlier.end(), path) == earlier.end()) {
            fresh.push_back(path);
        }
    }
    if (fresh.size() != 1) {
        return check(false, std::to_string(fresh.size()) + " new files " + prefix + "*" + suffix +
                                " of " + cp.name + " instead of one");
    }
    const std::string data = read_text_file(fresh[0]);
    const bool same =
        data.size() == content.size() && memcmp(data.data(), content.data(), data.size()) == 0;
    return check(same, fs::path(fresh[0]).filename().string() + ", " + std::to_string(data.size()) +
                           " bytes, " +
                           (same ? "as they were sent" : "not the bytes that were sent"));
}
