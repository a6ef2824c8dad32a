#include "sim/Demo.h"

#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <vector>

namespace fs = std::filesystem;

namespace {

const char* const DEMO_CPS[] = {"cp_wcdma", "cp_wcn", "cp_gnss"};

// Bytes fed at a time to a CP, and to all of them between two looks at the logs: well
// below the size of a log file.
const uint64_t FEED_STEP = 128 << 10;
const uint64_t WATCH_STEP = 512 << 10;

double to_mb(uint64_t bytes) {
    return static_cast<double>(bytes) / (1 << 20);
}

void print_tree(const fs::path& dir, const std::string& indent) {
    std::error_code ec;
    std::vector<fs::path> paths;
    for (fs::directory_iterator it(dir, ec), end; !ec && it != end; it.increment(ec)) {
        paths.push_back(it->path());
    }
    std::sort(paths.begin(), paths.end());
    for (const fs::path& path : paths) {
        const std::string name = path.filename().string();
        if (fs::is_directory(fs::symlink_status(path, ec))) {
            printf("%s%s/\n", indent.c_str(), name.c_str());
            print_tree(path, indent + "    ");
        } else if (fs::is_regular_file(fs::symlink_status(path, ec))) {
            const int width = std::max(1, 64 - static_cast<int>(indent.size()));
            printf("%s%-*s %9llu\n", indent.c_str(), width, name.c_str(),
                   static_cast<unsigned long long>(fs::file_size(path, ec)));
        }
    }
}

}  // namespace

Demo::Demo(const DemoOptions& options) : m_options(options), m_tty(isatty(STDOUT_FILENO) != 0) {}

void Demo::clear_line() {
    if (m_tty) {
        fputs("\r\033[K", stdout);
    }
}

void Demo::say(const std::string& text) {
    clear_line();
    printf("%5.1f s  %s\n", m_now, text.c_str());
    fflush(stdout);
}

bool Demo::set_up() {
    if (!m_handset.create(m_options.root)) {
        fprintf(stderr, "kestsim: %s\n", m_handset.error().c_str());
        return false;
    }
    printf("Simulated handset: %s\n", m_handset.root().c_str());
    for (const char* name : DEMO_CPS) {
        if (!m_handset.add_cp(name)) {
            fprintf(stderr, "kestsim: %s\n", m_handset.error().c_str());
            return false;
        }
    }
    const SimSizes& sizes = m_handset.sizes();
    printf("Log files of %u MB, quota %u MB internal and %u MB on the SD card; %u KB/s from each",
           sizes.log_file, sizes.data, sizes.sd, m_options.rate);
    for (const auto& cp : m_handset.cps()) {
        printf(" %s", cp->name.c_str());
    }
    printf(
        "\nRunning %s for %.0f s; Ctrl-C ends it earlier.\n"
        "Below: MB fed, MB on disk, sets, files, MB of each quota ([ ] marks the medium in "
        "use)\n\n",
        m_options.program.c_str(), m_options.seconds);
    fflush(stdout);
    m_logs = std::make_unique<LogCollector>(m_handset);
    if (!m_service.start(m_options.program, m_handset)) {
        fprintf(stderr, "kestsim: cannot run %s: %s\n", m_options.program.c_str(), strerror(errno));
        return false;
    }
    return true;
}

// A device that is full takes the rest later: nothing is dropped on this side.
void Demo::feed(double elapsed) {
    const auto due = static_cast<uint64_t>(elapsed * m_options.rate * 1024);
    for (const auto& cp : m_handset.cps()) {
        if (cp->fed < due) {
            m_unwatched += cp->feed(std::min<uint64_t>(due - cp->fed, FEED_STEP));
        }
    }
}

void Demo::switch_sd(double elapsed) {
    const bool wanted =
        m_options.sd && elapsed >= m_options.seconds / 3 && elapsed < m_options.seconds * 2 / 3;
    if (wanted != m_handset.sd_inserted()) {
        say(wanted ? "SD card inserted" : "SD card removed");
        const bool set = wanted ? m_handset.insert_sd() : m_handset.remove_sd();
        if (!set) {
            say(m_handset.error());
        }
    }
}

// Looks at the logs and tells what is new.
void Demo::watch() {
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

void Demo::show_progress(double elapsed) {
    uint64_t in = 0;
    uint64_t on_media = 0;
    unsigned files = 0;
    unsigned sets = 0;
    char quota[128] = "";
    char line[256];
    for (const auto& cp : m_handset.cps()) {
        in += cp->fed;
    }
    for (const LogCollector::Medium& m : m_logs->media()) {
        on_media += m.bytes;
        files += m.files;
        sets += m.sets;
        const bool in_use = m.name == m_medium;
        const size_t at = strlen(quota);
        snprintf(quota + at, sizeof quota - at, "  %s%s %.1f/%.0f%s", in_use ? "[" : "",
                 m.name.c_str(), to_mb(m.bytes), to_mb(m.quota), in_use ? "]" : "");
    }
    snprintf(line, sizeof line, "%5.1f s  in %.1f  disk %.1f  %u sets  %u files%s  (%u trimmed)",
             elapsed, to_mb(in), to_mb(on_media), sets, files, quota, m_logs->trimmed_files());
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

int Demo::run(const volatile sig_atomic_t* interrupted) {
    bool good = set_up();
    const bool started = good;
    if (started) {
        const auto start = std::chrono::steady_clock::now();
        double next_watch = 0;
        double next_line = 1;
        while (!*interrupted && m_now < m_options.seconds && m_service.alive()) {
            m_now = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
            switch_sd(m_now);
            feed(m_now);
            if (m_now >= next_watch || m_unwatched >= WATCH_STEP) {
                watch();
                next_watch = m_now + 0.05;
            }
            if (m_now >= next_line) {
                show_progress(m_now);
                next_line += 1;
            }
            usleep(5000);
        }
        if (*interrupted) {
            say("interrupted: ending early");
        }
        good = finish();
    }
    if (m_handset.root().empty()) {
        return 1;
    }
    // A root that this program made and never used is of no use to anybody.
    if (m_options.remove || (!started && m_options.root.empty())) {
        m_handset.remove_root();
    } else {
        printf("Everything is in %s (remove it when done).\n", m_handset.root().c_str());
    }
    return good ? 0 : 1;
}

bool Demo::finish() {
    bool good = m_service.alive();
    if (good) {
        say("feeding stops; waiting until the service has written everything out");
        m_handset.settle(*m_logs, 5000);
        good = m_service.alive();
    }
    if (good) {
        show_progress(m_now);
        clear_line();
        m_service.stop();
    } else {
        clear_line();
        printf("\nThe service ended by itself (%s). Its last messages:\n%s\n",
               m_service.status_text().c_str(), m_service.last_log_lines(10).c_str());
    }
    m_logs->scan();
    printf("\nWhat is in the root now:\n");
    print_tree(m_handset.root(), "    ");
    return show_verdict() && good;
}

bool Demo::show_verdict() {
    bool good = true;
    bool buffered = false;
    printf("\nEvery byte in the logs against what was fed:\n");
    for (const auto& cp : m_handset.cps()) {
        const StreamCheck::Result r = m_logs->check(*cp);
        printf("    %-9s %s\n", cp->name.c_str(), r.text().c_str());
        good = good && r.ok() && r.kept > 0;
        buffered = buffered || r.tail > 0;
        if (cp->modem) {
            const unsigned files = r.files + r.trimmed_files;
            printf("    %-9s time record at the head of %u of %u files\n", "", r.records, files);
            good = good && r.records == files;
        }
    }
    printf("%s%s\n\n", good ? "Nothing lost, nothing doubled" : "The check FAILED",
           good && buffered ? ", except what the service had in its buffer at its end." : ".");
    return good;
}
