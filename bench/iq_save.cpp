// SPDX-License-Identifier: Apache-2.0
// Saving the modem's whole I/Q memory, from the moment at which the service asks for the buffer
// until it releases it, beside dd with blocks of the same size.
#include <unistd.h>

#include "bench/BenchService.h"
#include "bench/Options.h"
#include "bench/Samples.h"
#include "bench/Table.h"
#include "bench/common.h"
#include "sim/device_control.h"

namespace {

constexpr uint32_t SIZE = IQ_MEMORY_SIZE;

struct SaveFigures {
    Samples cpu_ms;
    Samples wall_ms;
};

bool run_dd(const std::string& dir, const std::string& memory, SaveFigures& figures) {
    const std::string out = dir + "/copy";
    ChildProcess dd;
    const double start = now();
    if (!dd.start({{"dd", "if=" + memory, "of=" + out, "bs=10M"},
                   dir + "/messages",
                   "",
                   false,
                   {},
                   -1}) ||
        !dd.wait() || dd.status() != 0) {
        return fail("run", "dd");
    }
    figures.wall_ms.add((now() - start) * 1e3);
    figures.cpu_ms.add((dd.cost().user_s + dd.cost().system_s) * 1e3);
    return unlink(out.c_str()) == 0;
}

bool run_service(BenchService& service, SaveFigures& figures) {
    SimIqDevice& iq = service.handset().iq_memory();
    const unsigned released = iq.released();
    const double cpu = service.cpu();
    if (!iq.announce(0, SIZE)) {
        return fail("announce", "the samples");
    }
    while (iq.released() == released) {
        if (g_interrupted || !service.process().alive()) {
            return false;
        }
        sleep_ms(1);
    }
    figures.wall_ms.add(static_cast<double>(iq.released_ns() - iq.taken_ns()) / 1e6);
    const bool settled = service.settle();
    figures.cpu_ms.add((service.cpu() - cpu) * 1e3);
    // What was saved makes room for the next one.
    return settled && service.request("kestctl clear");
}

void add_row(Table& table, const std::string& name, const SaveFigures& figures,
             const SaveFigures& dd) {
    table.add_row({name, number_text(figures.cpu_ms.median(), 1),
                   number_text(figures.cpu_ms.over(dd.cpu_ms).median(), 2),
                   number_text(figures.wall_ms.median(), 1),
                   number_text(figures.wall_ms.least(), 1),
                   number_text(figures.wall_ms.over(dd.wall_ms).median(), 2)});
}

}  // namespace

Outcome measure_iq_save(const Options& options, const std::string& dir) {
    BenchService::Setup setup;
    setup.cps = {"cp_gnss", "cp_wcdma"};
    setup.quota_mib = 0;
    setup.iq_memory = true;
    BenchService service(options, dir, setup);
    if (!service.start() || !service.enable_iq()) {
        return NOT_MEASURED;
    }
    service.handset().iq_memory().write_samples(0, SIZE, 1);
    SaveFigures saved;
    SaveFigures dd;
    for (int round = 0; round <= options.rounds; ++round) {
        progress("iq", round, options.rounds);
        if (round == 1) {
            saved = dd = SaveFigures();
        }
        if (!run_dd(dir, service.handset().path(IQ_MEMORY), dd) || !run_service(service, saved)) {
            return NOT_MEASURED;
        }
    }
    Table table("Saving 128 MiB of I/Q samples",
                {"program", "CPU ms", "x dd", "ms in all", "least", "x dd"});
    add_row(table, "kestmodem", saved, dd);
    add_row(table, "dd bs=10M", dd, dd);
    return table.print();
}
