// SPDX-License-Identifier: Apache-2.0
// The benchmark of the service: reads the options, makes a directory for the measurement
// and runs it there.
#include <sched.h>
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
    if (options.count_calls) {
        return count_system_calls(options, dir.path());
    }
    if (!options.spread) {
        cpu_set_t one;
        CPU_ZERO(&one);
        CPU_SET(sched_getcpu(), &one);
        sched_setaffinity(0, sizeof(one), &one);
    }
    printf("%llu MiB through a FIFO in writes of %zu bytes, files of %llu MiB in %s, ",
           static_cast<unsigned long long>(options.mib), options.block,
           static_cast<unsigned long long>(FILE_MIB), options.dir.c_str());
    if (options.kept_mib) {
        printf("%llu MiB kept\n", static_cast<unsigned long long>(options.kept_mib));
    } else {
        printf("everything kept\n");
    }
    return measure_log_path(options, dir.path());
}
