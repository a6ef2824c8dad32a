// SPDX-License-Identifier: Apache-2.0
// The simulation on the command line: runs seeds, or one plan from a file, and shows what was
// found, shortened.
#include <malloc.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <time.h>
#include <unistd.h>

#include <map>
#include <string>

#include "simulation/Runner.h"

namespace {

const char* const WEATHERS[WEATHER_COUNT] = {"fair", "outside", "faults", "storm"};

struct Options {
    uint64_t seed = 1;
    uint64_t seeds = 1;
    uint64_t seconds = 0;
    uint64_t weather = WEATHER_COUNT;  // each in turn
    uint64_t events = 400;
    bool trace = false;
    bool no_shorten = false;
    bool first = false;
    const char* plan = nullptr;
};

void show_failure(const Plan& plan, const RunResult& result, const Options& options) {
    printf("  %s: %s\n", result.failure_class.c_str(), result.failure.c_str());
    if (options.no_shorten) {
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
    const std::string error = read_plan(options.plan, plan);
    if (!error.empty()) {
        fprintf(stderr, "%s\n", error.c_str());
        return 2;
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
         options.seconds > 0 ? now() - start < static_cast<double>(options.seconds)
                             : runs < options.seeds;
         ++seed) {
        const Weather weather = static_cast<Weather>(
            options.weather < WEATHER_COUNT ? options.weather : seed % WEATHER_COUNT);
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
    const std::map<std::string, bool*> flags = {{"--trace", &options.trace},
                                                {"--no-shorten", &options.no_shorten},
                                                {"--first", &options.first}};
    const std::map<std::string, uint64_t*> numbers = {{"--seed", &options.seed},
                                                      {"--seeds", &options.seeds},
                                                      {"--seconds", &options.seconds},
                                                      {"--weather", &options.weather},
                                                      {"--events", &options.events}};
    for (int i = 1; i < argc; ++i) {
        if (flags.count(argv[i])) {
            *flags.at(argv[i]) = true;
        } else if (argv[i][0] != '-') {
            options.plan = argv[i];
        } else if (!numbers.count(argv[i]) || i + 1 == argc) {
            return false;
        } else {
            *numbers.at(argv[i]) = strtoull(argv[i + 1], nullptr, 10);
            ++i;
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
#ifdef __GLIBC__
    // Memory that went back to the system after each look at a file costs a third of the time.
    mallopt(M_MMAP_THRESHOLD, 1 << 30);
    mallopt(M_TRIM_THRESHOLD, 1 << 30);
#endif
    return options.plan ? run_file(options) : run_seeds(options);
}
