// SPDX-License-Identifier: Apache-2.0
// What the service needs to delete many old files at once, after the quota was lowered, beside
// unlink alone on the same files in the same order.
#include <unistd.h>

#include "bench/BenchService.h"
#include "bench/OldLogs.h"
#include "bench/Options.h"
#include "bench/Samples.h"
#include "bench/Table.h"
#include "bench/common.h"

namespace {

const char SET[] = "2016-03-01-09-15-00";

struct TrimFigures {
    Samples service_us;  // CPU time a file
    Samples unlink_us;
    Samples wall_ms;  // of the service in all
};

bool run_unlink(const std::string& dir, unsigned files, TrimFigures& figures) {
    const OldLogs logs(dir + "/u", SET, "cp_gnss", files, MIB);
    const std::vector<std::string> paths = logs.paths();
    const double before = own_cpu();
    for (const std::string& path : paths) {
        unlink(path.c_str());
    }
    figures.unlink_us.add((own_cpu() - before) * 1e6 / files);
    return logs.made();
}

bool run_service(const Options& options, const std::string& dir, unsigned files,
                 TrimFigures& figures) {
    BenchService::Setup setup;
    setup.quota_mib = 0;
    BenchService service(options, dir, setup);
    // As large as the new quota: all of them have to go.
    const OldLogs logs(service.log_root(), SET, "cp_gnss", files, MIB);
    if (!logs.made() || !service.start() || !service.feed(4096, 4096) || !service.settle() ||
        !service.request("SET_DATA_MAX_SIZE 1")) {
        return false;
    }
    const double cpu = service.cpu();
    const double start = now();
    if (!service.feed(4096, 4096)) {
        return false;
    }
    while (access(logs.set_dir().c_str(), F_OK) == 0) {
        if (g_interrupted || !service.process().alive()) {
            return fail("trim", logs.set_dir());
        }
        sleep_ms(1);
    }
    figures.wall_ms.add((now() - start) * 1e3);
    const bool settled = service.settle();
    figures.service_us.add((service.cpu() - cpu) * 1e6 / files);
    return settled;
}

}  // namespace

Outcome measure_trimming(const Options& options, const std::string& dir) {
    Table table("Trimming, CPU time for a file in microseconds",
                {"files", "kestmodem", "least", "unlink", "x unlink", "kestmodem: ms in all"});
    for (const unsigned full : {1000u, 10000u, 100000u}) {
        const unsigned files = static_cast<unsigned>(options.scaled(full));
        TrimFigures figures;
        for (int round = 0; round <= options.rounds; ++round) {
            progress("trim " + std::to_string(files), round, options.rounds);
            if (round == 1) {
                figures = TrimFigures();
            }
            if (!run_unlink(dir, files, figures) || !run_service(options, dir, files, figures)) {
                return NOT_MEASURED;
            }
        }
        table.add_row({number_text(files), number_text(figures.service_us.median(), 2),
                       number_text(figures.service_us.least(), 2),
                       number_text(figures.unlink_us.median(), 2),
                       number_text(figures.service_us.over(figures.unlink_us).median(), 2),
                       number_text(figures.wall_ms.median(), 1)});
    }
    return table.print();
}
