// SPDX-License-Identifier: Apache-2.0
// Counts the service's system calls for a block in the steady state.
#include <stdio.h>
#include <unistd.h>

#include <algorithm>
#include <map>
#include <vector>

#include "bench/BenchService.h"
#include "bench/Options.h"
#include "bench/Table.h"
#include "bench/common.h"
#include "bench/feeding.h"
#include "sim/files.h"

namespace {

typedef std::map<std::string, long> Calls;

// The table that strace -c writes: five or six columns, the calls in the fourth and the
// name in the last.
Calls parse_calls(const std::string& text) {
    Calls calls;
    for (size_t pos = 0; pos < text.size();) {
        const size_t end = std::min(text.find('\n', pos), text.size());
        const std::string line = text.substr(pos, end - pos);
        pos = end + 1;
        char last[64] = "";
        char extra[64] = "";
        long count = 0;
        const int fields = sscanf(line.c_str(), "%*f %*f %*d %ld %63s %63s", &count, last, extra);
        if (fields >= 2) {
            calls[fields == 3 ? extra : last] += count;
        }
    }
    return calls;
}

// The calls of a whole run in which the service got this many blocks, one by one.
bool count_run(const Options& options, const std::string& dir, size_t block, int blocks,
               Calls& calls) {
    BenchService service(options, dir);
    const std::string table = dir + "/calls";
    unlink(table.c_str());
    // A property file that has just been changed is read again and again for a while.
    sleep_ms(200);
    // -D: the service stays the child, and strace ends with it.
    if (!service.start({"strace", "-D", "-f", "-c", "-o", table})) {
        return false;
    }
    const std::vector<uint8_t> data = log_text(block);
    bool fed = true;
    for (int i = 0; i < blocks && fed; ++i) {
        fed = write_all(service.log_device(), data.data(), block) &&
              wait_empty(service.log_device(), service.process());
    }
    wait_idle(service.process(), 50);
    fed = service.kill() && fed;
    for (int waited = 0; waited < START_TIMEOUT_MS; waited += 10) {
        const std::string text = read_text_file(table);
        if (text.find(" total\n") != std::string::npos) {
            calls = parse_calls(text);
            calls.erase("total");
            return fed;
        }
        sleep_ms(10);
    }
    return fail("no counts in", table);
}

}  // namespace

// The difference of a long and a short run within one log file is the steady state.
Outcome count_system_calls(const Options& options, const std::string& dir) {
    constexpr int SHORT_RUN = 16;
    const std::map<std::string, double> allowed = {
        {"poll", 1}, {"read", 1}, {"access", 1}, {"write", 0}, {"writev", 1}};
    Table table("System calls of the service for a block",
                {"bytes a block", "blocks", "call", "calls a block", "at most"});
    double most = 0;  // of what is above its limit
    for (const size_t block :
         {static_cast<size_t>(1024), static_cast<size_t>(4096), static_cast<size_t>(32768)}) {
        const int blocks = static_cast<int>(4 * MIB / block);
        Calls few;
        Calls many;
        if (!count_run(options, dir, block, SHORT_RUN, few) ||
            !count_run(options, dir, block, SHORT_RUN + blocks, many)) {
            return NOT_MEASURED;
        }
        for (const auto& [name, count] : many) {
            const double rate = static_cast<double>(count - few[name]) / blocks;
            const bool lookup = name.find("stat") != std::string::npos;  // of several names
            const auto limit = allowed.find(lookup ? "access" : name);
            const double limit_rate = limit == allowed.end() ? 0 : limit->second;
            most = std::max(most, rate - limit_rate);
            if (count != few[name]) {
                table.add_row({number_text(static_cast<double>(block)), number_text(blocks), name,
                               number_text(rate, 3), number_text(limit_rate)});
            }
        }
    }
    table.add_goal("calls beyond what a block must cost", most, 0.01, 2);
    return table.print();
}
