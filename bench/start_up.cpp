// SPDX-License-Identifier: Apache-2.0
// How long the service takes to start when the medium holds many log files: until its log device
// is open. It looks at every file, as find does when it asks for sizes.
#include "bench/BenchService.h"
#include "bench/OldLogs.h"
#include "bench/Options.h"
#include "bench/Samples.h"
#include "bench/Table.h"
#include "bench/common.h"

namespace {

struct StartFigures {
    Samples cpu_ms;
    Samples wall_ms;
};

bool run_find(const std::string& dir, const std::string& root, StartFigures& figures) {
    ChildProcess find;
    const double start = now();
    if (!find.start({{"find", root, "-type", "f", "-size", "+1000000k"},
                     dir + "/found",
                     "",
                     false,
                     {},
                     -1}) ||
        !find.wait() || find.status() != 0) {
        return fail("run", "find");
    }
    figures.wall_ms.add((now() - start) * 1e3);
    figures.cpu_ms.add((find.cost().user_s + find.cost().system_s) * 1e3);
    return true;
}

bool run_service(const Options& options, const std::string& dir, unsigned sets, unsigned files,
                 StartFigures& service_figures, StartFigures& find_figures) {
    BenchService::Setup setup;
    setup.quota_mib = 0;
    BenchService service(options, dir, setup);
    for (unsigned set = 0; set < sets; ++set) {
        const std::string name = "2016-03-" + std::to_string(10 + set) + "-09-15-00";
        if (!OldLogs(service.log_root(), name, "cp_gnss", files / sets, 4096).made()) {
            return false;
        }
    }
    if (files > 0 && !run_find(dir, service.log_root(), find_figures)) {
        return false;
    }
    const double start = now();
    if (!service.start()) {
        return false;
    }
    service_figures.wall_ms.add((now() - start) * 1e3);
    service_figures.cpu_ms.add(service.cpu() * 1e3);
    return true;
}

void add_row(Table& table, const std::string& name, const StartFigures& figures,
             const StartFigures& find) {
    table.add_row({name, number_text(figures.cpu_ms.median(), 1),
                   number_text(figures.cpu_ms.least(), 1),
                   number_text(figures.cpu_ms.over(find.cpu_ms).median(), 2),
                   number_text(figures.wall_ms.median(), 1)});
}

}  // namespace

Outcome measure_start(const Options& options, const std::string& dir) {
    constexpr unsigned SETS = 10;
    const unsigned files = static_cast<unsigned>(options.scaled(100000));
    StartFigures empty;
    StartFigures full;
    StartFigures find;
    for (int round = 0; round <= options.rounds; ++round) {
        progress("start", round, options.rounds);
        if (round == 1) {
            empty = full = find = StartFigures();
        }
        if (!run_service(options, dir, SETS, 0, empty, find) ||
            !run_service(options, dir, SETS, files, full, find)) {
            return NOT_MEASURED;
        }
    }
    const std::string over = " over " + number_text(files) + " files";
    Table table("Start-up", {"program", "CPU ms", "least", "x find", "ms in all"});
    add_row(table, "kestmodem over no files", empty, find);
    add_row(table, "kestmodem" + over, full, find);
    add_row(table, "find -size" + over, find, find);
    return table.print();
}
