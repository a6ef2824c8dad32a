// SPDX-License-Identifier: Apache-2.0
// The benchmark of the service: reads the options, makes a directory for the measurement
// and runs it there.
#include <signal.h>
#include <stdio.h>
#include <string.h>

#include <filesystem>

#include "bench/common.h"
#include "bench/measurements.h"
#include "sim/files.h"

namespace fs = std::filesystem;

namespace {

// scripts/bench --help prints the same file.
const char USAGE[] =
#include "usage.txt"
    ;

void on_signal(int /*signo*/) {
    g_interrupted = 1;
}

}  // namespace

int main(int argc, char** argv) {
    Options options;
    if (!parse_options(argc, argv, options)) {
        fputs(USAGE, stderr);
        return 2;
    }
    if (options.service.empty()) {
        std::error_code error;
        options.service = fs::read_symlink("/proc/self/exe", error).parent_path() / "kestmodem";
    }
    if (options.dir.empty()) {
        options.dir = default_dir(options);
    }
    struct sigaction action;
    memset(&action, 0, sizeof(action));
    action.sa_handler = on_signal;  // without SA_RESTART: a waiting write ends
    sigaction(SIGINT, &action, nullptr);
    sigaction(SIGTERM, &action, nullptr);
    action.sa_handler = SIG_IGN;
    sigaction(SIGPIPE, &action, nullptr);

    const TempDir dir(options.dir, "kestbench");
    if (dir.path().empty()) {
        fail("make a directory in", options.dir);
        return 2;
    }
    return options.measurement->run(options, dir.path());
}
