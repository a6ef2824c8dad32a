// SPDX-License-Identifier: Apache-2.0
// The benchmark of the service: says on what machine it runs, and makes the tables that are
// asked for, each in a directory of its own.
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/utsname.h>
#include <sys/vfs.h>
#include <unistd.h>

#include <algorithm>

#include "bench/common.h"
#include "bench/tables.h"
#include "sim/files.h"

namespace {

// scripts/bench --help prints the same file.
const char USAGE[] =
#include "usage.txt"
    ;

#ifdef __clang__
const char COMPILER[] = __VERSION__;  // names itself
#else
const char COMPILER[] = "g++ " __VERSION__;
#endif

void on_signal(int /*signo*/) {
    g_interrupted = 1;
}

// The first value of a "name : value" line of a file of the kernel.
std::string kernel_value(const char* file, const std::string& name) {
    const std::string text = "\n" + read_text_file(file);
    const size_t line = text.find("\n" + name);
    if (line == std::string::npos) {
        return "unknown";
    }
    const size_t at = text.find_first_not_of(" \t", text.find(':', line) + 1);
    return text.substr(at, text.find('\n', at) - at);
}

void print_machine(const Options& options) {
    struct utsname system = {};
    uname(&system);
    double load[3] = {};
    getloadavg(load, 3);
    struct statfs info = {};
    statfs(options.dir.c_str(), &info);
    printf("| machine | |\n|---|---|\n");
    printf("| processor | %s, %ld CPUs |\n", kernel_value("/proc/cpuinfo", "model name").c_str(),
           sysconf(_SC_NPROCESSORS_ONLN));
    printf("| memory | %s |\n", kernel_value("/proc/meminfo", "MemTotal").c_str());
    printf("| kernel | %s %s, %s |\n", system.sysname, system.release, system.machine);
    printf("| compiler | %s |\n", COMPILER);
    printf("| logs on | %s, file system type %#lx |\n", options.dir.c_str(),
           static_cast<unsigned long>(info.f_type));
    printf("| load at the start | %.2f %.2f %.2f |\n", load[0], load[1], load[2]);
    printf("| rounds | %d, stream of %llu MiB |\n\n", options.rounds,
           static_cast<unsigned long long>(options.mib));
    fflush(stdout);
}

Outcome make_table(const Options& options, const TableMaker& table) {
    const TempDir dir(options.dir, "kestbench");
    if (dir.path().empty()) {
        fail("make a directory in", options.dir);
        return NOT_MEASURED;
    }
    const Outcome outcome = table.run(options, dir.path());
    if (outcome == NOT_MEASURED) {
        fprintf(stderr, "bench: the table %s could not be made\n", table.name);
    }
    // Figures that mean nothing miss no goal.
    return options.quick && outcome == MISSED ? REACHED : outcome;
}

}  // namespace

int main(int argc, char** argv) {
    Options options;
    if (!parse_options(argc, argv, options)) {
        fputs(USAGE, stderr);
        return NOT_MEASURED;
    }
    struct sigaction action;
    memset(&action, 0, sizeof(action));
    action.sa_handler = on_signal;  // without SA_RESTART: a waiting write ends
    sigaction(SIGINT, &action, nullptr);
    sigaction(SIGTERM, &action, nullptr);
    action.sa_handler = SIG_IGN;
    sigaction(SIGPIPE, &action, nullptr);

    if (!options.spread) {
        stay_on_this_cpu();
    }
    print_machine(options);
    Outcome outcome = REACHED;
    for (const TableMaker* table : options.tables) {
        if (!g_interrupted) {
            outcome = std::max(outcome, make_table(options, *table));
        }
    }
    return g_interrupted ? NOT_MEASURED : outcome;
}
