// SPDX-License-Identifier: Apache-2.0
// How long a log device has to hold its data while the service does something else: the longest
// time between two moments at which the service had read everything. A block follows as soon as
// the last one was read. On all CPUs, for the saving of I/Q samples has a thread of its own.
#include <unistd.h>

#include <atomic>
#include <thread>

#include "bench/AllCpus.h"
#include "bench/BenchService.h"
#include "bench/OldLogs.h"
#include "bench/Options.h"
#include "bench/Samples.h"
#include "bench/Table.h"
#include "bench/common.h"
#include "bench/feeding.h"
#include "sim/device_control.h"

namespace {

constexpr size_t BLOCK = 4096;
constexpr unsigned LEFT_MIB = 400;  // of old logs after trimming

struct Load {
    const char* name;
    bool save;
    bool trim;
    bool storm;
};

const Load LOADS[] = {{"nothing else", false, false, false},
                      {"128 MiB of I/Q samples are saved", true, false, false},
                      {"10,000 files are trimmed", false, true, false},
                      {"requests come without a pause", false, false, true},
                      {"all of it at once", true, true, true}};

// Does what the load is, for a second at least.
bool make_load(BenchService& service, const Load& load, const std::string& last_trimmed) {
    SimIqDevice& iq = service.handset().iq_memory();
    const double start = now();
    if ((load.save && !iq.announce(0, IQ_MEMORY_SIZE)) ||
        (load.trim && !service.request("SET_DATA_MAX_SIZE " + std::to_string(LEFT_MIB)))) {
        return false;
    }
    while (now() - start < 1 || (load.save && iq.released() == 0) ||
           (load.trim && access(last_trimmed.c_str(), F_OK) == 0)) {
        if (now() - start > START_TIMEOUT_MS / 1000 || g_interrupted) {
            return fail("gaps: no end while", load.name);
        }
        if (!load.storm) {
            sleep_ms(1);
        } else if (!service.request("GET_LOG_STATE GNSS", "OK ON")) {
            return false;
        }
    }
    return true;
}

// Adds the longest gap in milliseconds, and the median one.
bool run(const Options& options, const std::string& dir, const Load& load, Samples& longest,
         Samples& usual) {
    BenchService::Setup setup;
    setup.cps = {"cp_gnss", "cp_wcdma"};
    setup.quota_mib = 0;
    setup.iq_memory = true;
    BenchService service(options, dir, setup);
    const unsigned trimmed = static_cast<unsigned>(options.scaled(10000));
    const OldLogs old(service.log_root(), "2016-03-01-09-15-00", "cp_gnss",
                      load.trim ? trimmed + LEFT_MIB : 1, MIB);
    if (!old.made() || !service.start() || !service.connect() || !service.feed(BLOCK, BLOCK) ||
        (load.save && !service.enable_iq()) || !service.settle()) {
        return false;
    }
    std::atomic<bool> done{false};
    bool good = false;
    std::thread worker([&] {
        good = make_load(service, load, old.path(load.trim ? trimmed - 1 : 0));
        done = true;
    });
    Samples gaps;
    bool fed = true;
    for (double last = now(); fed && !done;) {
        fed = service.feed(BLOCK, BLOCK) && wait_empty(service.log_device(), service.process());
        const double read = now();
        gaps.add((read - last) * 1e3);
        last = read;
    }
    worker.join();
    longest.add(gaps.greatest());
    usual.add(gaps.median());
    return good && fed;
}

}  // namespace

Outcome measure_read_gaps(const Options& options, const std::string& dir) {
    const AllCpus everywhere;
    Table table("Longest time between two reads of a log device, in milliseconds",
                {"meanwhile", "median of the rounds", "least", "longest", "usual time"});
    for (const Load& load : LOADS) {
        Samples longest;
        Samples usual;
        for (int round = 1; round <= options.rounds; ++round) {
            progress(std::string("gaps while ") + load.name, round, options.rounds);
            if (!run(options, dir, load, longest, usual)) {
                return NOT_MEASURED;
            }
        }
        table.add_row({load.name, number_text(longest.median(), 2), number_text(longest.least(), 2),
                       number_text(longest.greatest(), 2), number_text(usual.median(), 3)});
    }
    return table.print();
}
