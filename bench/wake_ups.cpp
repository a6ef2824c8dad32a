// SPDX-License-Identifier: Apache-2.0
// How often the service wakes up, which is what keeps a handset from sleeping, for a log of
// 100 kB/s that comes in writes of several sizes. Beside cat, which does nothing but read.
#include <sys/stat.h>
#include <unistd.h>

#include "bench/BenchService.h"
#include "bench/Options.h"
#include "bench/Table.h"
#include "bench/common.h"
#include "bench/feeding.h"
#include "bench/process_figures.h"

namespace {

constexpr double RATE = 100000;  // bytes a second

double wake_ups(const ChildProcess& program) {
    return static_cast<double>(process_status(program.pid(), "voluntary_ctxt_switches"));
}

struct Counts {
    double service;
    double cat;
    double cpu_ms;  // of the service
    double seconds;
};

// Of both readers since they started.
Counts count(const BenchService& service, const ChildProcess& process, const ChildProcess& cat) {
    return {wake_ups(process), wake_ups(cat), service.cpu() * 1e3, now()};
}

// The same to both, in writes of so many bytes; 0 for no data.
bool feed_both(BenchService& service, int cat_device, size_t block, double seconds) {
    const double start = now();
    if (block == 0) {
        sleep_ms(static_cast<int>(seconds * 1000));
        return true;
    }
    for (double due = start; due < start + seconds; due += static_cast<double>(block) / RATE) {
        while (now() < due) {
            sleep_ms(1);
        }
        if (!service.feed(block, block) || !feed(cat_device, block, block, [](uint64_t) {})) {
            return false;
        }
    }
    return true;
}

}  // namespace

Outcome measure_wake_ups(const Options& options, const std::string& dir) {
    progress("wake-ups", 1, 1);
    const double seconds = options.quick ? 0.5 : 3;
    const std::string fifo = dir + "/fifo";
    ChildProcess cat;
    BenchService service(options, dir);
    if (mkfifo(fifo.c_str(), 0600) < 0 || !service.start() ||
        !cat.start({{"cat", fifo}, dir + "/out", "", false, {}, -1})) {
        return NOT_MEASURED;
    }
    const int cat_device = open_writer(fifo, cat);
    service.wait_steady();
    Table table("Wake-ups a second, log of 100 kB/s",
                {"bytes a write", "writes a second", "kestmodem", "cat", "kestmodem: CPU ms a s"});
    bool fed = cat_device >= 0;
    for (const size_t block : {0u, 100u, 1000u, 4000u, 32000u}) {
        const Counts before = count(service, service.process(), cat);
        fed = fed && feed_both(service, cat_device, block, seconds);
        const Counts after = count(service, service.process(), cat);
        const double took = after.seconds - before.seconds;
        table.add_row({block ? number_text(static_cast<double>(block)) : "no data",
                       number_text(block ? RATE / static_cast<double>(block) : 0),
                       number_text((after.service - before.service) / took, 1),
                       number_text((after.cat - before.cat) / took, 1),
                       number_text((after.cpu_ms - before.cpu_ms) / took, 2)});
    }
    close(cat_device);
    return fed ? table.print() : NOT_MEASURED;
}
