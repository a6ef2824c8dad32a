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

const char* const WEATHERS[WEATHER_COUNT] = {"fair", "outside", "faults", "storm"};

struct Options {
    uint64_t seed = 1;
    uint64_t seeds = 1;
    double seconds = 0;
    int weather = -1;
    size_t events = 400;
    bool trace = false;
    bool shorten = true;
    bool first = false;
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
    uint64_t* const to = reinterpret_cast<uint64_t*>(&sum);
    const uint64_t* const from = reinterpret_cast<const uint64_t*>(&more);
    for (size_t i = 0; i < sizeof(Counters) / sizeof(uint64_t); ++i) {
        to[i] += from[i];
    }
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
           number(result.digest));
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
            printf("seed %llu, %s: FAILED, digest %016llx\n", number(seed), WEATHERS[weather],
                   number(result.digest));
            show_failure(plan, result, options);
            fflush(stdout);
            if (options.first) {
                break;
            }
        }
    }
    printf(
        "%llu seeds, %llu failed; %.1f s, %.1f virtual days, %llu events, %llu calls, "
        "%llu faults, %llu kills, %.1f MB, %llu requests, %llu replies, %llu dump notices\n",
        number(runs), number(failures), now() - start, hours / 24, number(sum.events),
        number(sum.calls), number(sum.faults), number(sum.kills),
        static_cast<double>(sum.bytes) / 1e6, number(sum.requests), number(sum.replies),
        number(sum.dumps));
    return failures ? 1 : 0;
}

// False when an option is not known or lacks its value.
bool parse(int argc, char** argv, Options& options) {
    for (int i = 1; i < argc; ++i) {
        const std::string option = argv[i];
        if (option == "--trace") {
            options.trace = true;
        } else if (option == "--no-shorten") {
            options.shorten = false;
        } else if (option == "--first") {
            options.first = true;
        } else if (option[0] != '-') {
            options.plan = argv[i];
        } else if (++i == argc) {
            return false;
        } else {
            const uint64_t number = strtoull(argv[i], nullptr, 10);
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
                return false;
            }
        }
    }
    return true;
}

}  // namespace

int main(int argc, char** argv) {
    Options options;
    if (!parse(argc, argv, options)) {
        fputs("see scripts/simulate --help\n", stderr);
        return 2;
    }
    return options.plan ? run_file(options) : run_seeds(options);
}
