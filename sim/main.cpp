// kestsim: shows the service at work on a simulated handset and checks what it saves.
#include <getopt.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>

#include <filesystem>

#include "sim/Demo.h"

namespace fs = std::filesystem;

namespace {

volatile sig_atomic_t s_interrupted = 0;

void on_signal(int) {
    s_interrupted = 1;
}

const char USAGE[] =
    "usage: kestsim [options]\n"
    "Runs the service kestmodem on a simulated handset: a modem, a connectivity chip, a GNSS\n"
    "receiver and an audio DSP stream their logs while the SD card comes and goes, CPs crash,\n"
    "I/Q samples are captured and a client asks for this and that. Shows the progress and\n"
    "the resulting tree and checks that no byte was lost or doubled and that everything\n"
    "asked for came.\n"
    "\n"
    "  --kestmodem PATH  the service's program (default: the one beside this program)\n"
    "  --kestlog PATH    the program that reads the logs at the end (default: the one beside\n"
    "                    this program, if it is there)\n"
    "  --root DIR        root of the handset, absent or empty (default: a new one in /tmp)\n"
    "  --seconds N       length of the run (default 60), longer if the scenes need it\n"
    "  --rate KB         KB/s from each CP (default 500)\n"
    "  --fast            a run of 12 seconds at 2000 KB/s, with short scenes\n"
    "  --sd, --no-sd     whether the SD card comes and goes (default: it does)\n"
    "  --rm              remove the root at the end\n"
    "  --help            this text\n"
    "\n"
    "Exit status: 0 all checks passed, nothing lost or doubled, 1 otherwise, 2 wrong options.\n";

enum Option {
    OPT_PROGRAM = 1,
    OPT_READER,
    OPT_ROOT,
    OPT_SECONDS,
    OPT_RATE,
    OPT_FAST,
    OPT_SD,
    OPT_NO_SD,
    OPT_RM,
    OPT_HELP
};

const option OPTIONS[] = {
    {"kestmodem", required_argument, nullptr, OPT_PROGRAM},
    {"kestlog", required_argument, nullptr, OPT_READER},
    {"root", required_argument, nullptr, OPT_ROOT},
    {"seconds", required_argument, nullptr, OPT_SECONDS},
    {"rate", required_argument, nullptr, OPT_RATE},
    {"fast", no_argument, nullptr, OPT_FAST},
    {"sd", no_argument, nullptr, OPT_SD},
    {"no-sd", no_argument, nullptr, OPT_NO_SD},
    {"rm", no_argument, nullptr, OPT_RM},
    {"help", no_argument, nullptr, OPT_HELP},
    {nullptr, 0, nullptr, 0},
};

// A number above 0 and up to max.
bool parse_number(const char* text, double max, double* value) {
    char* end;
    *value = strtod(text, &end);
    return end != text && *end == '\0' && *value > 0 && *value <= max;
}

// 0 to go on, otherwise the exit status plus 1.
int parse_options(int argc, char** argv, DemoOptions& options) {
    double number = 0;
    for (int opt; (opt = getopt_long(argc, argv, "", OPTIONS, nullptr)) != -1;) {
        bool good = true;
        switch (opt) {
            case OPT_PROGRAM:
                options.program = optarg;
                break;
            case OPT_READER:
                options.reader = optarg;
                break;
            case OPT_ROOT:
                options.root = optarg;
                good = !options.root.empty();
                break;
            case OPT_SECONDS:
                good = parse_number(optarg, 1e6, &number);
                options.seconds = number;
                break;
            case OPT_RATE:
                good = parse_number(optarg, 1e6, &number) && number >= 1;
                options.rate = static_cast<unsigned>(number);
                break;
            case OPT_FAST:
                options.seconds = 12;
                options.fast = true;
                options.rate = 2000;
                break;
            case OPT_SD:
            case OPT_NO_SD:
                options.sd = opt == OPT_SD;
                break;
            case OPT_RM:
                options.remove = true;
                break;
            case OPT_HELP:
                fputs(USAGE, stdout);
                return 1;
            default:
                good = false;
        }
        if (!good) {
            fputs(USAGE, stderr);
            return 3;
        }
    }
    if (optind < argc) {
        fputs(USAGE, stderr);
        return 3;
    }
    return 0;
}

}  // namespace

int main(int argc, char** argv) {
    DemoOptions options;
    const int stop = parse_options(argc, argv, options);
    if (stop != 0) {
        return stop - 1;
    }
    std::error_code ec;
    const fs::path self = fs::read_symlink("/proc/self/exe", ec);
    if (options.program.empty()) {
        options.program = fs::path(self).replace_filename("kestmodem").string();
    }
    const fs::path reader = fs::path(self).replace_filename("kestlog");
    if (options.reader.empty() && fs::exists(reader, ec)) {
        options.reader = reader.string();
    }
    struct sigaction action = {};
    action.sa_handler = on_signal;
    action.sa_flags = static_cast<int>(SA_RESETHAND);  // a second Ctrl-C ends at once
    sigaction(SIGINT, &action, nullptr);
    sigaction(SIGTERM, &action, nullptr);
    signal(SIGPIPE, SIG_IGN);
    return Demo(options, &s_interrupted).run();
}
