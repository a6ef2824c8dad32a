// SPDX-License-Identifier: Apache-2.0
// What a new log file costs when its directory holds many: each older one gets the next number.
// Beside rename alone on the same number of files.
#include <stdio.h>
#include <time.h>
#include <unistd.h>

#include "bench/BenchService.h"
#include "bench/OldLogs.h"
#include "bench/Options.h"
#include "bench/Samples.h"
#include "bench/Table.h"
#include "bench/common.h"

namespace {

constexpr unsigned ROTATIONS = 5;

struct RotationFigures {
    Samples service_ms;  // CPU time of a rotation
    Samples rename_ms;
    Samples wall_ms;  // of the service
};

// The name of a set that starts then.
std::string set_name(time_t time) {
    struct tm t = {};
    localtime_r(&time, &t);
    char name[32];
    strftime(name, sizeof(name), "%Y-%m-%d-%H-%M-%S", &t);
    return name;
}

bool run_rename(const std::string& dir, unsigned files, RotationFigures& figures) {
    const OldLogs logs(dir + "/r", set_name(0), "cp_gnss", files, 4096);
    double cpu = 0;
    for (unsigned rotation = 0; rotation < ROTATIONS; ++rotation) {
        const std::vector<std::string> from = logs.paths(rotation);
        const std::vector<std::string> to = logs.paths(rotation + 1);
        const double before = own_cpu();
        for (unsigned i = 0; i < files; ++i) {
            rename(from[i].c_str(), to[i].c_str());
        }
        cpu += own_cpu() - before;
    }
    figures.rename_ms.add(cpu * 1e3 / ROTATIONS);
    return logs.made();
}

bool run_service(const Options& options, const std::string& dir, unsigned files,
                 RotationFigures& figures) {
    BenchService::Setup setup;
    setup.quota_mib = 0;
    BenchService service(options, dir, setup);
    // A set that begins within a second in which there is one goes on in it.
    const time_t begin = time(nullptr) + 2;
    const OldLogs logs(service.log_root(), set_name(begin), "cp_gnss", files, 4096);
    if (!logs.made() || !service.start()) {
        return false;
    }
    while (time(nullptr) < begin) {
        sleep_ms(5);
    }
    // Size 0: a new file at each write.
    const size_t block = 100;
    if (!service.feed(block, block) || !service.settle() ||
        !service.request("SET_LOG_FILE_SIZE 0") || !service.feed(block, block) ||
        !service.settle()) {
        return false;
    }
    const double cpu = service.cpu();
    double wall = 0;
    for (unsigned i = 0; i < ROTATIONS; ++i) {
        const std::string youngest = logs.path(files - 1, i + 2);  // is renamed last
        const double start = now();
        if (!service.feed(block, block)) {
            return false;
        }
        while (access(youngest.c_str(), F_OK) != 0) {
            if (now() - start > 10) {
                return fail("no rotation to", youngest);
            }
            sleep_ms(1);
        }
        wall += now() - start;
        if (!service.settle()) {
            return false;
        }
    }
    figures.service_ms.add((service.cpu() - cpu) * 1e3 / ROTATIONS);
    figures.wall_ms.add(wall * 1e3 / ROTATIONS);
    return true;
}

}  // namespace

Outcome measure_rotation(const Options& options, const std::string& dir) {
    const unsigned files = static_cast<unsigned>(options.scaled(5000));
    RotationFigures figures;
    for (int round = 0; round <= options.rounds; ++round) {
        progress("rotate", round, options.rounds);
        if (round == 1) {
            figures = RotationFigures();
        }
        if (!run_rename(dir, files, figures) || !run_service(options, dir, files, figures)) {
            return NOT_MEASURED;
        }
    }
    Table table("A new log file in a directory of " + number_text(files),
                {"program", "CPU ms", "least", "x rename", "ms in all"});
    table.add_row({"kestmodem", number_text(figures.service_ms.median(), 1),
                   number_text(figures.service_ms.least(), 1),
                   number_text(figures.service_ms.over(figures.rename_ms).median(), 2),
                   number_text(figures.wall_ms.median(), 1)});
    table.add_row({"rename of each file", number_text(figures.rename_ms.median(), 1),
                   number_text(figures.rename_ms.least(), 1), number_text(1, 2)});
    return table.print();
}
