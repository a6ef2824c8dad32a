// SPDX-License-Identifier: Apache-2.0
// How long a client waits for the reply to a control request: while the service has nothing else
// to do, and while a log comes as fast as the service takes it. Beside a process that only
// answers. On all CPUs, as with any client.
#include <atomic>
#include <thread>

#include "bench/AllCpus.h"
#include "bench/BenchService.h"
#include "bench/EchoServer.h"
#include "bench/Options.h"
#include "bench/Samples.h"
#include "bench/Table.h"
#include "bench/common.h"

namespace {

// Adds the times in microseconds of so many requests.
bool ask(SimControlClient& client, unsigned requests, Samples& times) {
    for (unsigned i = 0; i < requests; ++i) {
        const double start = now();
        if (client.request("GET_LOG_STATE GNSS", START_TIMEOUT_MS).compare(0, 2, "OK") != 0) {
            return fail("no reply to request", std::to_string(i));
        }
        times.add((now() - start) * 1e6);
    }
    return true;
}

void add_row(Table& table, const std::string& name, const Samples& times) {
    table.add_row({name, number_text(times.least(), 1), number_text(times.median(), 1),
                   number_text(times.quantile(0.99), 1), number_text(times.quantile(0.999), 1),
                   number_text(times.greatest(), 1)});
}

}  // namespace

Outcome measure_requests(const Options& options, const std::string& dir) {
    const AllCpus everywhere;
    const unsigned requests = static_cast<unsigned>(options.scaled(5000));
    BenchService service(options, dir);
    const EchoServer server(dir + "/e");
    SimControlClient echo;
    if (!service.start() || !service.connect() || !server.ok() ||
        !echo.connect(dir + "/e", START_TIMEOUT_MS)) {
        return NOT_MEASURED;
    }
    Samples alone;
    Samples idle;
    Samples busy;
    bool good = true;
    for (int round = 1; round <= options.rounds && good; ++round) {
        progress("requests", round, options.rounds);
        good = ask(echo, requests, alone) && ask(service.client(), requests, idle);
        std::atomic<bool> stop{false};
        std::thread writer([&] {
            while (!stop && service.feed(MIB, 32768)) {
            }
        });
        good = good && ask(service.client(), requests, busy);
        stop = true;
        writer.join();
        good = good && service.settle();
    }
    if (!good) {
        return NOT_MEASURED;
    }
    Table table("Round trip of a control request in microseconds, " +
                    number_text(static_cast<double>(idle.count())) + " requests",
                {"service", "least", "median", "99 %", "99.9 %", "longest"});
    add_row(table, "a process that only answers", alone);
    add_row(table, "kestmodem, idle", idle);
    add_row(table, "kestmodem, log at the full rate", busy);
    return table.print();
}
