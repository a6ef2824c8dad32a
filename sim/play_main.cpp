// SPDX-License-Identifier: Apache-2.0
// kestsim_play: plays a script against the service and prints what came of it.
#include <errno.h>
#include <getopt.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include <filesystem>

#include "sim/ScriptPlayer.h"
#include "sim/stop_signals.h"

namespace {

volatile sig_atomic_t s_interrupted = 0;

void on_signal(int) {
    s_interrupted = 1;
}

const char USAGE[] =
#include "sim/play_usage.txt"
    ;

const option OPTIONS[] = {
    {"kestmodem", required_argument, nullptr, 'm'},
    {"keep", no_argument, nullptr, 'k'},
    {"help", no_argument, nullptr, 'h'},
    {nullptr, 0, nullptr, 0},
};

}  // namespace

int main(int argc, char** argv) {
    std::error_code ec;
    std::string program =
        std::filesystem::read_symlink("/proc/self/exe", ec).replace_filename("kestmodem").string();
    bool keep = false;
    for (int opt; (opt = getopt_long(argc, argv, "", OPTIONS, nullptr)) != -1;) {
        switch (opt) {
            case 'm':
                program = optarg;
                break;
            case 'k':
                keep = true;
                break;
            case 'h':
                return fputs(USAGE, stdout) >= 0 && fflush(stdout) == 0 ? 0 : 1;
            default:
                fputs(USAGE, stderr);
                return 2;
        }
    }
    if (optind + 1 != argc) {
        fputs(USAGE, stderr);
        return 2;
    }
    handle_stop_signals(on_signal);
    setenv("TZ", "UTC0", 1);  // time records tell the local time
    ScriptPlayer player(program, keep, &s_interrupted);
    const bool played = player.play(argv[optind]);
    const bool printed = fputs(player.outcome().c_str(), stdout) >= 0 && fflush(stdout) == 0;
    if (!printed) {
        fprintf(stderr, "standard output: %s\n", strerror(errno));
    }
    if (!played) {
        fprintf(stderr, "%s\n", player.error().c_str());
    }
    if (keep) {
        fprintf(stderr, "The handset's root is %s\n", player.root().c_str());
    }
    return played && printed ? 0 : 1;
}
