// SPDX-License-Identifier: Apache-2.0

#include "sim/Demo.h"

#include <stdio.h>

#include <algorithm>
#include <filesystem>
#include <vector>

#include "sim/run_program.h"
#include "sim/scenes/scenes.h"

namespace fs = std::filesystem;

namespace {

// Played in this order, each not before its share of the demo's time has passed.
const struct {
    double share;
    void (*play)(DemoStage& stage);
} SCENES[] = {
    {0.04, play_control},     {0.08, play_retrieval},       {0.20, play_sd_inserted},
    {0.28, play_modem_crash}, {0.28, play_parsing_library}, {0.44, play_wcn_crash},
    {0.58, play_sd_removed},  {0.64, play_new_firmware},    {0.68, play_audio_dsp},
    {0.76, play_iq_capture},
};

void print_tree(const fs::path& dir, const std::string& indent) {
    std::error_code ec;
    std::vector<fs::path> paths;
    for (fs::directory_iterator it(dir, ec), end; !ec && it != end; it.increment(ec)) {
        paths.push_back(it->path());
    }
    std::sort(paths.begin(), paths.end());
    for (const fs::path& path : paths) {
        const std::string name = path.filename().string();
        if (name[0] == '.') {
            continue;  // the simulator's own
        }
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

Demo::Demo(const DemoOptions& options, const volatile sig_atomic_t* interrupted)
    : m_options(options), m_interrupted(interrupted), m_stage(m_options, interrupted) {}

void Demo::show_plan() {
    const SimSizes& sizes = m_stage.handset().sizes();
    printf("Log files of %u MB, quota %u MB internal and %u MB on the SD card; %u KB/s from each",
           sizes.log_file, sizes.data, sizes.sd, m_options.rate);
    for (const auto& cp : m_stage.handset().cps()) {
        printf(" %s", cp->name.c_str());
    }
    printf(
        "\nRunning %s for %.0f s; Ctrl-C ends it earlier.\n"
        "Below: MB fed, MB on disk, sets, files, MB of each quota ([ ] marks the medium in "
        "use)\n\n",
        m_options.program.c_str(), m_options.seconds);
    fflush(stdout);
}

void Demo::play() {
    if (!m_stage.check(m_stage.client().connect(m_stage.handset().root(), 5000),
                       "the service listens for control clients")) {
        return;
    }
    for (const auto& scene : SCENES) {
        if (m_stage.run_until(scene.share * m_options.seconds)) {
            scene.play(m_stage);
        }
    }
    m_stage.run_until(m_options.seconds);
}

int Demo::run() {
    const bool started = m_stage.set_up();
    bool good = started;
    if (started) {
        show_plan();
        play();
        if (*m_interrupted) {
            m_stage.say("interrupted: ending early");
        }
        good = finish();
    }
    m_stage.take_down();
    end_root(m_stage.handset(), m_options, started, good);
    return good ? 0 : 1;
}

bool Demo::finish() {
    ServiceProcess& service = m_stage.service();
    bool good = service.alive();
    if (good) {
        m_stage.say("feeding stops; waiting until the service has written everything out");
        m_stage.handset().settle(m_stage.logs(), 5000);
        good = service.alive();
    }
    if (good) {
        m_stage.show_progress();
        m_stage.clear_line();
        service.stop();
    } else {
        m_stage.clear_line();
        printf("\nThe service ended by itself (%s). Its last messages:\n%s\n",
               service.status_text().c_str(), service.last_log_lines(10).c_str());
    }
    m_stage.logs().scan();
    printf("\nWhat is in the root now:\n");
    print_tree(m_stage.handset().root(), "    ");
    const bool read = read_logs();
    const bool verdict = show_verdict();
    const bool reported = write_report();
    return verdict && read && reported && good;
}

bool Demo::read_logs() {
    if (m_options.reader.empty()) {
        return true;
    }
    bool good = true;
    printf("\nWhat kestlog says of the logs:\n");
    for (const LogCollector::Medium& medium : m_stage.logs().media()) {
        std::error_code ec;
        if (!fs::exists(medium.log_root, ec)) {
            continue;
        }
        std::string text;
        const int status = run_program({m_options.reader, "verify", medium.log_root}, &text);
        printf("    %-9s %s", medium.name.c_str(), text.empty() ? "nothing\n" : text.c_str());
        if (status != 0) {
            printf("    %-9s FAILED: exit status %d\n", "", status);
            good = false;
        }
    }
    return good;
}

bool Demo::write_report() {
    if (m_options.reader.empty() || m_options.report.empty()) {
        return true;
    }
    std::string text;
    const int status = run_program({m_options.reader, "report", "--force", "--iq-format=ci16_le",
                                    "--iq-rate=3840000", "--pcm-format=s16le", "--pcm-rate=16000",
                                    "-o", m_options.report, m_stage.handset().root()},
                                   &text);
    std::error_code ec;
    const std::string path = fs::absolute(m_options.report, ec).string();
    if (status == 0) {
        printf("A page of all this for your browser: %s\n", path.c_str());
    } else {
        printf("FAILED: kestlog report, exit status %d: %s\n", status, text.c_str());
    }
    return status == 0;
}

bool Demo::show_verdict() {
    bool good = true;
    bool buffered = false;
    printf("\nEvery byte in the logs against what was fed:\n");
    for (const auto& cp : m_stage.handset().cps()) {
        const StreamCheck::Result r = m_stage.logs().check(*cp);
        printf("    %-9s %s\n", cp->name.c_str(), r.text().c_str());
        good = good && r.ok() && r.kept > 0;
        buffered = buffered || r.tail > 0;
        if (cp->modem) {
            const unsigned files = r.files + r.trimmed_files;
            printf("    %-9s time record at the head of %u of %u files\n", "", r.records, files);
            good = good && r.records == files;
        }
    }
    printf("%s%s\n", good ? "Nothing lost, nothing doubled" : "The check FAILED",
           good && buffered ? ", except what the service had in its buffer at its end." : ".");
    const size_t failed = m_stage.failures().size();
    printf("Checks in the scenes: %u passed, %zu failed%s\n", m_stage.passed(), failed,
           failed > 0 ? ":" : "");
    for (const std::string& failure : m_stage.failures()) {
        printf("    %s\n", failure.c_str());
    }
    printf("\n");
    return good && failed == 0;
}
