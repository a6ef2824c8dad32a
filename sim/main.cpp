// SPDX-License-Identifier: Apache-2.0
// kestsim: shows the service at work on a simulated handset and checks what it saves, plays a
// recorded card again, or just serves.
#include <getopt.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include <algorithm>
#include <filesystem>
#include <utility>

#include "sim/Demo.h"
#include "sim/Replay.h"
#include "sim/Serve.h"
#include "sim/SimHandset.h"
#include "sim/byte_text.h"
#include "sim/stop_signals.h"

namespace fs = std::filesystem;

namespace {

volatile sig_atomic_t s_interrupted = 0;
volatile sig_atomic_t s_crash_wanted = 0;

void on_signal(int) {
    s_interrupted = 1;
}

void on_crash_wanted(int) {
    s_crash_wanted = 1;
}

// scripts/demo --help prints the same file.
const char USAGE[] =
#include "sim/usage.txt"
    ;

enum Option {
    OPT_PROGRAM = 1,
    OPT_READER,
    OPT_REPORT,
    OPT_ROOT,
    OPT_SECONDS,
    OPT_RATE,
    OPT_FAST,
    OPT_SD,
    OPT_NO_SD,
    OPT_KEEP,
    OPT_REPLAY,
    OPT_SPEED,
    OPT_SERVE,
    OPT_HELP
};

const option OPTIONS[] = {
    {"kestmodem", required_argument, nullptr, OPT_PROGRAM},
    {"kestlog", required_argument, nullptr, OPT_READER},
    {"report", required_argument, nullptr, OPT_REPORT},
    {"root", required_argument, nullptr, OPT_ROOT},
    {"seconds", required_argument, nullptr, OPT_SECONDS},
    {"rate", required_argument, nullptr, OPT_RATE},
    {"fast", no_argument, nullptr, OPT_FAST},
    {"sd", no_argument, nullptr, OPT_SD},
    {"no-sd", no_argument, nullptr, OPT_NO_SD},
    {"keep", no_argument, nullptr, OPT_KEEP},
    {"replay", required_argument, nullptr, OPT_REPLAY},
    {"speed", required_argument, nullptr, OPT_SPEED},
    {"serve", no_argument, nullptr, OPT_SERVE},
    {"help", no_argument, nullptr, OPT_HELP},
    {nullptr, 0, nullptr, 0},
};

// A number above 0 and up to max.
bool parse_number(const char* text, double max, double* value) {
    char* end;
    *value = strtod(text, &end);
    return end != text && *end == '\0' && *value > 0 && *value <= max;
}

// "KB", for all, or "CP=KB", 0 for a silent one.
bool parse_rate(const std::string& text, DemoOptions& options) {
    const size_t at = text.find('=');
    const std::string cp = at == std::string::npos ? "" : text.substr(0, at);
    const std::string kb = at == std::string::npos ? text : text.substr(at + 1);
    double number = 0;
    const bool silent = !cp.empty() && kb == "0";
    if (!silent && (!parse_number(kb.c_str(), 1e6, &number) || number < 1)) {
        return false;
    }
    bool modem;
    if (at == std::string::npos) {
        options.rate = static_cast<unsigned>(number);
    } else if (cp == "agdsp" || SimHandset::knows_cp(cp, &modem)) {
        options.rates[cp] = static_cast<unsigned>(number);
    } else {
        return false;
    }
    return true;
}

// The names are printed: they have no control bytes.
bool parse_name(const char* text, std::string* name) {
    *name = text;
    return !name->empty() && std::none_of(name->begin(), name->end(),
                                          [](unsigned char c) { return c < 0x20 || c == 0x7f; });
}

// For parse_options().
int refuse(const std::string& arg) {
    fprintf(stderr, "kestsim: %s: unknown, or a wrong value; see kestsim --help\n",
            show_name(arg).c_str());
    return 3;
}

// Whether options that only one way to run has are given with it.
bool fits(const DemoOptions& options, bool has_speed) {
    const auto only_served = [](const auto& rate) {
        return rate.first == "agdsp" || rate.second == 0;
    };
    return !(options.serve && !options.replay.empty()) && !(has_speed && options.replay.empty()) &&
           (options.serve || std::none_of(options.rates.begin(), options.rates.end(), only_served));
}

// 0 to go on, otherwise the exit status plus 1.
int parse_options(int argc, char** argv, DemoOptions& options) {
    double seconds = 0;
    unsigned rate = 0;
    std::swap(options.seconds, seconds);  // 0: not given
    std::swap(options.rate, rate);
    bool has_speed = false;
    opterr = 0;  // it would print whatever is in a wrong option
    for (int opt; (opt = getopt_long(argc, argv, "", OPTIONS, nullptr)) != -1;) {
        bool good = true;
        double number = 0;
        switch (opt) {
            case OPT_PROGRAM:
                good = parse_name(optarg, &options.program);
                break;
            case OPT_READER:
                good = parse_name(optarg, &options.reader);
                break;
            case OPT_REPORT:
                good = parse_name(optarg, &options.report);
                break;
            case OPT_ROOT:
                good = parse_name(optarg, &options.root);
                break;
            case OPT_SECONDS:
                good = parse_number(optarg, 1e6, &number);
                options.seconds = number;
                break;
            case OPT_RATE:
                good = parse_rate(optarg, options);
                break;
            case OPT_REPLAY:
                options.replay = optarg;
                good = !options.replay.empty();
                break;
            case OPT_SPEED:
                good = strcmp(optarg, "max") == 0 || parse_number(optarg, 1e6, &number);
                options.speed = number;
                has_speed = true;
                break;
            case OPT_SERVE:
                options.serve = true;
                break;
            case OPT_FAST:
                options.fast = true;
                seconds = 12;
                rate = 2000;
                break;
            case OPT_SD:
            case OPT_NO_SD:
                options.sd = options.card_in = opt == OPT_SD;
                break;
            case OPT_KEEP:
                options.keep = true;
                break;
            case OPT_HELP:
                fputs(USAGE, stdout);
                return 1;
            default:
                good = false;
        }
        if (!good) {
            return refuse(argv[optind - 1]);
        }
    }
    options.seconds = options.seconds > 0 ? options.seconds : seconds;
    options.rate = options.rate > 0 ? options.rate : rate;
    if (optind < argc) {
        return refuse(argv[optind]);
    }
    if (!fits(options, has_speed)) {
        fputs("kestsim: these options do not go together; see kestsim --help\n", stderr);
        return 3;
    }
    return 0;
}

}  // namespace

int main(int argc, char** argv) {
    struct sigaction crash = {};
    crash.sa_handler = on_crash_wanted;
    crash.sa_flags = SA_RESTART;
    sigaction(SIGUSR1, &crash, nullptr);  // first of all: it may come as soon as this runs
    DemoOptions options;
    const int stop = parse_options(argc, argv, options);
    if (stop != 0) {
        return stop - 1;
    }
    std::error_code ec;
    const fs::path self = fs::read_symlink("/proc/self/exe", ec);
    if (options.program.empty()) {
        options.program = fs::path(self).replace_filename("kestmodem").string();
        // As packages place them.
        if (!fs::exists(options.program, ec)) {
            options.program = (self.parent_path().parent_path() / "sbin/kestmodem").string();
        }
    }
    const fs::path reader = fs::path(self).replace_filename("kestlog");
    if (options.reader.empty() && fs::exists(reader, ec)) {
        options.reader = reader.string();
    }
    handle_stop_signals(on_signal);
    if (!options.replay.empty()) {
        return Replay(options, &s_interrupted).run();
    }
    if (options.serve) {
        return Serve(options, &s_interrupted, &s_crash_wanted).run();
    }
    return Demo(options, &s_interrupted).run();
}
