// SPDX-License-Identifier: Apache-2.0
// The log path: the same bytes go through a FIFO to the service and to other programs in turn,
// and what each costs is compared, start and end included.
//
// All are treated alike: the same writer, files on the same file system, the same file size and
// amount of data kept. Most delete old files themselves; for those that do not, the benchmark
// does it, and what that costs it is added. Of the service the GNSS channel is used, whose files
// begin with no time record.
//
// Writer and reader share one CPU: on two, what the reader's copies cost depends on which
// caches the data is in, and the ratio is different in every round (--spread shows it).
#include <algorithm>
#include <map>
#include <string>
#include <vector>

#include "bench/BenchService.h"
#include "bench/LogProgram.h"
#include "bench/Options.h"
#include "bench/Samples.h"
#include "bench/Table.h"
#include "bench/common.h"
#include "bench/feeding.h"
#include "bench/process_figures.h"

namespace {

constexpr double GOAL = 1.05;  // CPU of the service relative to the floor
const char SERVICE[] = "kestmodem";

struct LogFigures {
    Samples cpu;  // seconds for a GiB
    Samples speed;
    Samples block;  // KiB a read
    Samples memory;
};

// The service was started some time ago.
LogRun run_service(const Options& options, BenchService& service, size_t block) {
    LogRun run;
    const uint64_t size = options.mib * MIB;
    const double start = now();
    if (service.feed(size, block) && wait_empty(service.log_device(), service.process())) {
        run.wall_s = now() - start;
        // The last block is read but may not be stored yet.
        run.ok = service.settle();
        run.peak_kib = process_status(service.process().pid(), "VmHWM");
        run.ok = service.kill() && service.check_logs(size) && run.ok;
        run.cost = service.process().cost();
    }
    return run;
}

void add(LogFigures& figures, const LogRun& run, uint64_t mib) {
    const double size = static_cast<double>(mib * MIB);
    const double gib = size / static_cast<double>(GIB);
    figures.cpu.add((run.cost.user_s + run.cost.system_s + run.deleting_s) / gib);
    figures.speed.add(size / 1e6 / run.wall_s);
    figures.block.add(size / 1024 / static_cast<double>(run.cost.reads));
    figures.memory.add(static_cast<double>(run.peak_kib) / 1024);
}

// One round: the floor comes last but one, right before the service. False when something does
// not run.
bool run_all(const Options& options, const std::string& dir, size_t block,
             const std::vector<LogProgram>& programs, std::map<std::string, LogFigures>& figures) {
    BenchService service(options, dir);
    if (!service.start()) {
        return false;
    }
    for (auto program = programs.rbegin(); program != programs.rend(); ++program) {
        const LogRun run = program->run(dir, options.mib, block);
        if (!run.ok) {
            return false;
        }
        add(figures[program->name], run, options.mib);
    }
    service.wait_steady();
    const LogRun run = run_service(options, service, block);
    if (run.ok) {
        add(figures[SERVICE], run, options.mib);
    }
    return run.ok;
}

// Empty when something does not run.
std::map<std::string, LogFigures> measure(const Options& options, const std::string& dir,
                                          size_t block, const std::vector<LogProgram>& programs) {
    std::map<std::string, LogFigures> figures;
    for (int round = 0; round <= options.rounds; ++round) {
        progress("log path, writes of " + std::to_string(block), round, options.rounds);
        if (round == 1) {
            figures.clear();
        }
        if (!run_all(options, dir, block, programs, figures)) {
            return {};
        }
    }
    return figures;
}

void add_row(Table& table, const std::string& name, const LogFigures& figures,
             const LogFigures& floor) {
    table.add_row(
        {name, number_text(figures.cpu.median(), 3), number_text(figures.cpu.least(), 3),
         number_text(figures.cpu.over(floor.cpu).median(), 2), number_text(figures.speed.median()),
         number_text(figures.speed.over(floor.speed).median(), 2),
         number_text(figures.block.median(), 1), number_text(figures.memory.median(), 1)});
}

}  // namespace

Outcome measure_log_path(const Options& options, const std::string& dir) {
    std::vector<LogProgram> programs;
    std::string missing;
    for (const LogProgram& program : log_programs(options)) {
        if (program.installed()) {
            programs.push_back(program);
        } else {
            missing += std::string(" ") + program.name;
        }
    }
    Outcome outcome = REACHED;
    for (const size_t block : {static_cast<size_t>(32768), static_cast<size_t>(512)}) {
        std::map<std::string, LogFigures> figures = measure(options, dir, block, programs);
        if (figures.empty()) {
            return NOT_MEASURED;
        }
        const LogFigures& floor = figures[programs[0].name];
        Table table("Log path, writes of " + number_text(static_cast<double>(block)) + " bytes",
                    {"reader", "CPU s/GiB", "least", "x floor", "MB/s", "x floor", "KiB a read",
                     "peak MiB"});
        add_row(table, SERVICE, figures[SERVICE], floor);
        for (const LogProgram& program : programs) {
            add_row(table, program.name, figures[program.name], floor);
        }
        if (!missing.empty()) {
            table.add_note("Not installed and left out:" + missing + ".");
        }
        table.add_goal("CPU time of " + std::string(SERVICE) + " relative to the floor",
                       figures[SERVICE].cpu.over(floor.cpu).median(), GOAL, 2);
        outcome = std::max(outcome, table.print());
    }
    return outcome;
}
