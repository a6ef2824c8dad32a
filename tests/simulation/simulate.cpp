// SPDX-License-Identifier: Apache-2.0
// The simulation on the command line: runs seeds, or one plan from a file, and shows what was
// found, shortened.
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <time.h>
#include <unistd.h>

#include <fstream>
#include <string>

#include "simulation/Runner.h"

namespace {

const char USAGE[] =
    "usage: simulate [OPTION...] [PLAN]\n"
    "Runs the service in a simulated world and checks all that it does.\n"
    "  PLAN              runs the events of this file\n"
    "  --seed N          first seed, 1\n"
    "  --seeds N         how many seeds, 1\n"
    "  --seconds N       as many seeds as fit into so many seconds\n"
    "  --weather 0..3    fair, outside, faults, storm; all of them in turn when left out\n"
    "  --events N        events of a seed, 400\n"
    "  --trace           prints all that happens\n"
    "  --no-shorten      does not look for a shorter plan\n";

const char* const WEATHERS[WEATHER_COUNT] = {"fair", "outside", "faults", "storm"};

struct Options {
    uint64_t seed = 1;
    uint64_t seeds = 1;
    double seconds = 0;
    int weather = -1;
    size_t events = 400;
    bool trace = false;
    bool shorten = true;
    const char* plan = nullptr;
};

void show_failure(const Plan& plan, const RunResult& result, const Options& options) {
    printf("  %s: %s\n", result.failure_class.c_str(), result.failure.c_str());
    if (!options.shorten) {
        return;
    }
    const Plan shorter = shorten(plan, result.failure_class);
    printf("  the same with %zu of %zu events:\n", shorter.size(), plan.size());
    for (const Event& event : shorter) {
        printf("    %s\n", to_text(event).c_str());
    }
}

void add(Counters& sum, const Counters& more) {
    sum.events += more.events;
    sum.calls += more.calls;
    sum.faults += more.faults;
    sum.kills += more.kills;
    sum.bytes += more.bytes;
    sum.requests += more.requests;
    sum.replies += more.replies;
    sum.dumps += more.dumps;
    sum.passes += more.passes;
    sum.checks += more.checks;
}

double now() {
    struct timespec t;
    clock_gettime(CLOCK_MONOTONIC, &t);
    return static_cast<double>(t.tv_sec) + static_cast<double>(t.tv_nsec) / 1e9;
}

int run_file(const Options& options) {
    Plan plan;
    std::ifstream in(options.plan);
    if (!in) {
        perror(options.plan);
        return 2;
    }
    for (std::string line; std::getline(in, line);) {
        if (!add_line(plan, line)) {
            fprintf(stderr, "%s: not an event: %s\n", options.plan, line.c_str());
            return 2;
        }
    }
    const RunResult result = run_plan(plan, options.trace ? STDOUT_FILENO : -1);
    printf("%s: %s, digest %016llx\n", options.plan, result.passed ? "passed" : "FAILED",
           static_cast<unsigned long long>(result.digest));
    if (!result.passed) {
        show_failure(plan, result, options);
    }
    return result.passed ? 0 : 1;
}

int run_seeds(const Options& options) {
    Counters sum = {};
    double hours = 0;
    uint64_t failures = 0;
    uint64_t runs = 0;
    const double start = now();
    for (uint64_t seed = options.seed;
         options.seconds > 0 ? now() - start < options.seconds : runs < options.seeds; ++seed) {
        const Weather weather = static_cast<Weather>(
            options.weather >= 0 ? static_cast<uint64_t>(options.weather) : seed % WEATHER_COUNT);
        const Plan plan = make_plan(seed, weather, options.events);
        const RunResult result = run_plan(plan, options.trace ? STDOUT_FILENO : -1);
        ++runs;
        add(sum, result.counters);
        hours += result.hours;
        if (!result.passed) {
            ++failures;
            printf("seed %llu, %s: FAILED, digest %016llx\n", static_cast<unsigned long long>(seed),
                   WEATHERS[weather], static_cast<unsigned long long>(result.digest));
            show_failure(plan, result, options);
            fflush(stdout);
        }
    }
    printf(
        "%llu seeds, %llu failed; %.1f s, %.1f virtual days, %llu events, %llu calls, "
        "%llu faults, %llu kills, %.1f MB, %llu requests, %llu replies, %llu dump notices\n",
        static_cast<unsigned long long>(runs), static_cast<unsigned long long>(failures),
        now() - start, hours / 24, static_cast<unsigned long long>(sum.events),
        static_cast<unsigned long long>(sum.calls), static_cast<unsigned long long>(sum.faults),
        static_cast<unsigned long long>(sum.kills), static_cast<double>(sum.bytes) / 1e6,
        static_cast<unsigned long long>(sum.requests), static_cast<unsigned long long>(sum.replies),
        static_cast<unsigned long long>(sum.dumps));
    return failures ? 1 : 0;
}

}  // namespace

int main(int argc, char** argv) {
    Options options;
    for (int i = 1; i < argc; ++i) {
        const std::string option = argv[i];
        const char* const value = i + 1 < argc ? argv[i + 1] : nullptr;
        if (option == "--trace") {
            options.trace = true;
        } else if (option == "--no-shorten") {
            options.shorten = false;
        } else if (option[0] != '-') {
            options.plan = argv[i];
        } else if (!value) {
            fputs(USAGE, option == "--help" ? stdout : stderr);
            return option == "--help" ? 0 : 2;
        } else {
            ++i;
            const uint64_t number = strtoull(value, nullptr, 10);
            if (option == "--seed") {
                options.seed = number;
            } else if (option == "--seeds") {
                options.seeds = number;
            } else if (option == "--seconds") {
                options.seconds = static_cast<double>(number);
            } else if (option == "--weather" && number < WEATHER_COUNT) {
                options.weather = static_cast<int>(number);
            } else if (option == "--events") {
                options.events = number;
            } else {
                fputs(USAGE, stderr);
                return 2;
            }
        }
    }
    return options.plan ? run_file(options) : run_seeds(options);
}
