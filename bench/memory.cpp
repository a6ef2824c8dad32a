// SPDX-License-Identifier: Apache-2.0
// The memory of the service with a channel for every co-processor that it knows, before any data
// came and while all channels have a file open.
#include "bench/BenchService.h"
#include "bench/Options.h"
#include "bench/Table.h"
#include "bench/common.h"
#include "bench/process_figures.h"

namespace {

constexpr double GOAL_MIB = 4;

double status_mib(BenchService& service, const char* field) {
    return static_cast<double>(process_status(service.process().pid(), field)) / 1024;
}

void add_row(Table& table, const std::string& name, BenchService& service) {
    std::vector<std::string> cells = {name};
    for (const char* field : {"VmRSS", "VmHWM", "RssAnon", "RssFile"}) {
        cells.push_back(number_text(status_mib(service, field), 2));
    }
    table.add_row(cells);
}

// So much to each channel.
bool feed_all(BenchService& service, uint64_t size) {
    const std::vector<uint8_t> data(4096, 'x');
    if (!service.feed(size, data.size())) {
        return false;
    }
    for (uint64_t fed = 0; fed < size; fed += data.size()) {
        for (const auto& cp : service.handset().cps()) {
            if (cp != service.handset().cps()[0] && !(cp->log.feed(data.data(), data.size()) > 0 &&
                                                      cp->log.wait_drained(START_TIMEOUT_MS))) {
                return fail("feed", cp->name);
            }
        }
        service.handset().audio_dsp().log().feed(data.data(), data.size());
    }
    return service.settle();
}

}  // namespace

Outcome measure_memory(const Options& options, const std::string& dir) {
    progress("memory", 1, 1);
    BenchService::Setup setup;
    setup.cps = {"cp_gnss",  "cp_wcdma", "cp_td-scdma", "cp_3mode",
                 "cp_4mode", "cp_5mode", "cp_wcn"};
    setup.audio_dsp = true;
    BenchService service(options, dir, setup);
    if (!service.start() || !service.settle()) {
        return NOT_MEASURED;
    }
    Table table("Memory of the service with eight channels, in MiB",
                {"when", "VmRSS", "VmHWM", "of it heap and stack", "program and libraries"});
    add_row(table, "before any data", service);
    if (!feed_all(service, 2 * MIB)) {
        return NOT_MEASURED;
    }
    add_row(table, "eight logs open, 2 MiB each", service);
    table.add_goal("peak memory in MiB", status_mib(service, "VmHWM"), GOAL_MIB, 2);
    return table.print();
}
