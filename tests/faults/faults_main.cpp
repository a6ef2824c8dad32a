// SPDX-License-Identifier: Apache-2.0
// Plays recordings against the real program while a call of the C library fails: each kind,
// the Nth time, once and from then on, for every N until the script runs untouched.
#include <errno.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include <chrono>
#include <filesystem>

#include "faults/FaultPlayer.h"
#include "sim/SharedFile.h"
#include "sim/fault_kinds.h"
#include "sim/files.h"

namespace {

const char USAGE[] =
    "usage: faults KIND|all N|all once|always|both SECONDS|short SCRIPT...\n"
    "For scripts/faults and ctest: scripts/faults --help tells what it is all about.\n";

// Of a kind in a script: more say nothing new.
const unsigned MAX_FAILURES = 2;

struct Options {
    std::string kind;  // "all": every one
    int n = 0;         // 0: every one
    bool once = true;
    bool always = true;
    bool is_short = false;
    double seconds = 0;
};

struct Totals {
    unsigned runs = 0, hits = 0, failures = 0, with_loss = 0;
    size_t most_lost = 0;
};

class Campaign {
public:
    Campaign(const Options& options, const std::string& program, FaultPlan* plan)
        : m_options(options), m_program(program), m_plan(plan) {}

    void play(const std::string& script);
    const Totals& totals() const { return m_totals; }

private:
    bool over() const {
        const auto passed = std::chrono::steady_clock::now() - m_start;
        return std::chrono::duration<double>(passed).count() > m_options.seconds;
    }
    void plan(const FaultKind& kind, int first, bool always) {
        memset(static_cast<void*>(m_plan), 0, sizeof *m_plan);
        m_plan->call = kind.call;
        m_plan->error = kind.error;
        m_plan->first = first;
        // No signal comes for ever.
        const int more = kind.error == EINTR ? 100 : 1 << 30;
        m_plan->last = first == 0 ? 0 : always ? first + more : first;
    }
    // Whether the fault came about.
    bool run(const std::string& script, const ScriptResult& clean, const FaultKind& kind, int n,
             bool always);

    const Options m_options;
    const std::string m_program;
    FaultPlan* const m_plan;
    Totals m_totals;
    unsigned m_choice = 0;
    const std::chrono::steady_clock::time_point m_start = std::chrono::steady_clock::now();
};

bool Campaign::run(const std::string& script, const ScriptResult& clean, const FaultKind& kind,
                   int n, bool always) {
    plan(kind, n, always);
    FaultPlayer player(m_program, m_plan);
    bool hit = false;
    size_t lost = 0;
    const bool good = player.play_with_fault(script, clean, &hit, &lost);
    ++m_totals.runs;
    m_totals.hits += hit;
    m_totals.with_loss += lost > 0;
    m_totals.most_lost = std::max(m_totals.most_lost, lost);
    if (!good) {
        ++m_totals.failures;
        const std::string name = std::filesystem::path(script).stem().string();
        printf("FAILED: scripts/faults --kind %s --n %d --%s %s\n%s\n", kind.name, n,
               always ? "always" : "once", name.c_str(), player.error().c_str());
        fflush(stdout);
    }
    return hit;
}

void Campaign::play(const std::string& script) {
    const Totals before = m_totals;
    ScriptResult clean;
    // Twice the same: a machine under load can be too slow for a time-out.
    for (bool same = false; !same;) {
        const ScriptResult before_that = clean;
        clean = ScriptResult();
        plan(FAULT_KINDS[0], 0, false);
        FaultPlayer player(m_program, m_plan);
        if (!player.play_untouched(script, &clean)) {
            printf("FAILED without a fault: %s\n", player.error().c_str());
            ++m_totals.failures;
            return;
        }
        same = clean.dialogue == before_that.dialogue && clean.records == before_that.records &&
               clean.descriptors == before_that.descriptors;
    }
    m_choice = static_cast<unsigned>(std::filesystem::path(script).stem().string().size());
    for (const FaultKind& kind : FAULT_KINDS) {
        if (m_options.kind != "all" && m_options.kind != kind.name) {
            continue;
        }
        for (const bool always : {false, true}) {
            if (!(always ? m_options.always : m_options.once)) {
                continue;
            }
            if (m_options.is_short) {
                // One in so many of what the long form does, at small and larger N in turn.
                if (++m_choice % 7 == 0 && !over()) {
                    run(script, clean, kind, 1 + static_cast<int>(m_choice / 7 % 4) * 2, always);
                }
                continue;
            }
            const int first = m_options.n ? m_options.n : 1;
            const unsigned failures = m_totals.failures;
            for (int n = first; !over() && m_totals.failures < failures + MAX_FAILURES &&
                                run(script, clean, kind, n, always) && !m_options.n;
                 ++n) {
            }
        }
    }
    printf("%s: %u runs, %u with a fault, %u failed; log bytes lost in %u\n",
           std::filesystem::path(script).stem().c_str(), m_totals.runs - before.runs,
           m_totals.hits - before.hits, m_totals.failures - before.failures,
           m_totals.with_loss - before.with_loss);
    fflush(stdout);
}

}  // namespace

int main(int argc, char** argv) {
    if (argc < 6) {
        for (const FaultKind& kind : FAULT_KINDS) {
            puts(kind.name);
        }
        fputs(USAGE, stderr);
        return 2;
    }
    Options options;
    options.kind = argv[1];
    options.n = atoi(argv[2]);
    options.once = strcmp(argv[3], "always") != 0;
    options.always = strcmp(argv[3], "once") != 0;
    options.is_short = strcmp(argv[4], "short") == 0;
    options.seconds = options.is_short ? 1e9 : atof(argv[4]);
    const TempDir dir(temp_dir(), "kestfaults");
    SharedFile plan;
    if (!plan.create(dir.path() + "/plan", sizeof(FaultPlan))) {
        perror("the plan of faults");
        return 1;
    }
    signal(SIGPIPE, SIG_IGN);
    const auto self = std::filesystem::read_symlink("/proc/self/exe");
    setenv("TZ", "UTC0", 1);
    setenv(FAULT_PLAN_VARIABLE, (dir.path() + "/plan").c_str(), 1);
    setenv("LD_PRELOAD",
           std::filesystem::path(self).replace_filename("libkestsim_faults.so").c_str(), 1);
    // A build with the address sanitizer wants its own library in front.
    setenv("ASAN_OPTIONS", "verify_asan_link_order=0", 1);
    Campaign campaign(options, std::filesystem::path(self).replace_filename("kestmodem"),
                      reinterpret_cast<FaultPlan*>(plan.data()));
    for (int i = 5; i < argc; ++i) {
        campaign.play(argv[i]);
    }
    const Totals& totals = campaign.totals();
    printf("%u runs, %u with a fault, %u failed; log bytes lost in %u, at most %zu\n", totals.runs,
           totals.hits, totals.failures, totals.with_loss, totals.most_lost);
    return totals.failures > 0 || (totals.hits == 0 && options.n == 0) ? 1 : 0;
}
