// SPDX-License-Identifier: Apache-2.0
// The real program for a long time: killed at random moments and started again on the same
// tree, then with everything at once at the full rate. No byte may be unexplained, and what
// the program holds of the machine may not grow.
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <filesystem>
#include <map>
#include <random>
#include <thread>

#include "sim/DemoStage.h"
#include "sim/scenes/scenes.h"

namespace fs = std::filesystem;

namespace {

const unsigned RATE = 8000;             // KB/s from each CP
const uint64_t STAGED = 65536 + 32768;  // that a kill may cost: the buffer, and the block read
const uint64_t RSS_GROWTH_KB = 1024;

bool complain(const std::string& text) {
    printf("FAILED: %s\n", text.c_str());
    return false;
}

// Positions in the stream of each CP up to which the service had read when it was killed.
typedef std::map<std::string, std::vector<uint64_t>> Deaths;

// Everything of each CP is in its files, in order and once, but for what was staged when the
// service was killed: a gap ends where a life ended, or several that wrote nothing.
bool check_streams(LogCollector& logs, const SimHandset& handset, const Deaths& deaths) {
    bool good = true;
    for (const auto& cp : handset.cps()) {
        const StreamCheck::Result r = logs.check(*cp);
        printf("  %-9s %s\n", cp->name.c_str(), r.text().substr(6).c_str());
        if (r.doubled > 0 || r.foreign > 0 || r.misordered > 0 || r.kept == 0 ||
            r.tail >= StreamCheck::BUFFER_SIZE) {
            good = complain(cp->name + ": bytes without an explanation");
        }
        const auto found = deaths.find(cp->name);
        for (const StreamCheck::Gap& gap : r.gaps) {
            const auto lives =
                found == deaths.end()
                    ? 0
                    : std::count_if(found->second.begin(), found->second.end(),
                                    [&](uint64_t position) {
                                        return gap.start < position && position <= gap.end;
                                    });
            if (gap.end - gap.start > STAGED * static_cast<uint64_t>(lives)) {
                good = complain(cp->name + ": lost from " + std::to_string(gap.start) + " to " +
                                std::to_string(gap.end));
            }
        }
    }
    return good;
}

// ---- Killed

bool play_kills(const std::string& program, unsigned kills, unsigned seed) {
    std::mt19937 generator(seed);
    const auto below = [&](unsigned limit) { return static_cast<unsigned>(generator() % limit); };
    SimHandset handset;
    if (!handset.create("")) {
        return complain(handset.error());
    }
    for (const char* name : {"cp_wcdma", "cp_wcn", "cp_gnss"}) {
        handset.add_cp(name);
    }
    LogCollector logs(handset);
    ServiceProcess service;
    Deaths deaths;
    bool good = true;
    for (unsigned i = 0; good && i <= kills; ++i) {
        good = service.start(program, handset) || complain("no service");
        const unsigned steps = 1 + below(40);  // of a millisecond and a little
        for (unsigned step = 0; good && step < steps; ++step) {
            for (const auto& cp : handset.cps()) {
                cp->feed(size_t{4096} * below(12));
            }
            if (below(50) == 0) {
                handset.sd_inserted() ? handset.remove_sd() : handset.insert_sd();
            }
            usleep(1000);
            logs.scan();
            good = service.alive() || complain("the service has ended: " + service.status_text());
        }
        if (i < kills) {
            service.signal(SIGKILL);
            service.wait();
            for (const auto& cp : handset.cps()) {
                deaths[cp->name].push_back(cp->fed - cp->log.pending());
            }
        }
    }
    good = good && (handset.settle(logs, 60000) || complain("the logs do not come to their end"));
    service.stop();
    printf("%u kills, %u log files trimmed:\n", kills, logs.trimmed_files());
    good = check_streams(logs, handset, deaths) && good;
    if (good) {
        handset.remove_root();
    } else {
        printf("Everything is in %s\n", handset.root().c_str());
    }
    return good;
}

// ---- Everything at once

// One after the other, while all CPs log and a client asks as fast as it is answered.
void play_round(DemoStage& stage) {
    play_retrieval(stage);
    play_sd_inserted(stage);
    play_modem_crash(stage);
    play_wcn_crash(stage);
    play_sd_removed(stage);
    play_iq_capture(stage);
    for (const std::string& path : stage.cp_files("cp_wcdma", "cp_wcdma_wiq_", ".bin")) {
        unlink(path.c_str());  // the quota spares them
    }
    stage.set_quotas(true);
    play_control(stage);
}

class Storm {
public:
    explicit Storm(const std::string& root) : m_thread([this, root] { run(root); }) {}
    ~Storm() { stop(); }
    void stop() {
        m_stop = true;
        if (m_thread.joinable()) {
            m_thread.join();
        }
    }
    unsigned good() const { return m_good; }
    unsigned bad() const { return m_bad; }

private:
    void run(const std::string& root) {
        SimControlClient client;
        client.connect(root, 5000);
        while (!m_stop) {
            const bool answered = client.request("GET_LOG_STATE GNSS", 60000) == "OK ON" &&
                                  client.request("nonsense", 60000) == "ERROR 1";
            ++(answered ? m_good : m_bad);
            usleep(answered ? 500 : 100000);
        }
    }

    std::atomic<bool> m_stop{false};
    std::atomic<unsigned> m_good{0}, m_bad{0};
    std::thread m_thread;
};

bool play_everything(const std::string& program, double seconds) {
    volatile sig_atomic_t never = 0;
    DemoOptions options;
    options.program = program;
    options.seconds = seconds;
    options.rate = RATE;
    options.fast = true;
    DemoStage stage(options, &never);
    if (!stage.set_up() || !stage.client().connect(stage.handset().root(), 5000)) {
        return complain("cannot start");
    }
    Storm storm(stage.handset().root());
    play_audio_dsp(stage);
    size_t first_rss_kb = 0;
    size_t rss_kb = 0;
    size_t first_open = 0;
    size_t open = 0;
    unsigned rounds = 0;
    bool good = true;
    do {
        play_round(stage);
        rss_kb = std::max(rss_kb, stage.service().rss_kb());
        // A client that has left is noticed a moment later.
        stage.wait_until(
            [&] {
                open = stage.service().descriptors().size();
                return rounds == 0 || open <= first_open;
            },
            1);
        first_open = rounds == 0 ? open : first_open;
        // An emulator and the sanitizers keep memory of the first rounds.
        first_rss_kb = ++rounds <= 2 ? rss_kb : first_rss_kb;
        printf("\nround %u: RSS %zu KB, %zu descriptors\n", rounds, rss_kb, open);
    } while (!stage.over() && (rounds < 2 || stage.now() < seconds));
    storm.stop();
    good = stage.service().alive() || complain("the service has ended");
    good = (stage.handset().settle(stage.logs(), 60000) || complain("logs without an end")) && good;
    good = check_streams(stage.logs(), stage.handset(), {}) && good;
    stage.service().stop();
    stage.take_down();
    printf(
        "%u rounds in %.0f s, %u pairs of requests beside, RSS %zu KB after two and at "
        "most %zu KB, %zu and %zu descriptors; checks: %u passed, %zu failed\n",
        rounds, stage.now(), storm.good(), first_rss_kb, rss_kb, first_open, open, stage.passed(),
        stage.failures().size());
    for (const std::string& failure : stage.failures()) {
        good = complain(failure);
    }
    if (storm.bad() > 0 || storm.good() == 0) {
        good = complain(std::to_string(storm.bad()) + " requests without the right answer");
    }
    if (rss_kb > first_rss_kb + RSS_GROWTH_KB) {
        good = complain("the memory grows");
    }
    if (open > first_open) {
        good = complain("descriptors are left over");
    }
    stage.handset().remove_root();
    return good;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 4) {
        fputs("usage: soak KILLS SECONDS SEED; see scripts/soak --help\n", stderr);
        return 2;
    }
    const auto kills = static_cast<unsigned>(atoi(argv[1]));
    const double seconds = atof(argv[2]);
    const auto seed = static_cast<unsigned>(atoi(argv[3]));
    signal(SIGPIPE, SIG_IGN);
    setvbuf(stdout, nullptr, _IOLBF, 0);
    const std::string program =
        fs::read_symlink("/proc/self/exe").replace_filename("kestmodem").string();
    bool good = kills == 0 || play_kills(program, kills, seed);
    good = (seconds <= 0 || play_everything(program, seconds)) && good;
    printf("%s\n", good ? "All is well." : "Something is not.");
    return good ? 0 : 1;
}
