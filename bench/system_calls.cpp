// SPDX-License-Identifier: Apache-2.0
// Counts the service's system calls for a block in the steady state.
#include <stdio.h>
#include <unistd.h>

#include <algorithm>
#include <map>
#include <vector>

#include "bench/BenchHandset.h"
#include "bench/Options.h"
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
    const BenchHandset handset(dir, options.kept_mib);
    const std::string table = dir + "/calls";
    unlink(table.c_str());
    // A property file that has just been changed is read again and again for a while.
    sleep_ms(200);
    // -D: the service stays the child, and strace ends with it.
    ServiceProcess service;
    const int fd =
        start_service({"strace", "-D", "-f", "-c", "-o", table, options.service}, handset, service);
    if (fd < 0) {
        return false;
    }
    const std::vector<uint8_t> data(block, 0x5a);
    bool fed = true;
    for (int i = 0; i < blocks && fed; ++i) {
        fed = write_all(fd, data.data(), block) && wait_empty(fd, service);
    }
    wait_idle(service, 50);
    fed = end(service) && fed;
    close(fd);
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
int count_system_calls(const Options& options, const std::string& dir) {
    constexpr int SHORT_RUN = 16;
    const std::map<std::string, double> allowed = {
        {"poll", 1}, {"read", 1}, {"access", 1}, {"write", 0}, {"writev", 1}};
    bool within = true;
    for (const size_t block :
         {static_cast<size_t>(1024), static_cast<size_t>(4096), static_cast<size_t>(32768)}) {
        const int blocks = static_cast<int>(4 * MIB / block);
        Calls few;
        Calls many;
        if (!count_run(options, dir, block, SHORT_RUN, few) ||
            !count_run(options, dir, block, SHORT_RUN + blocks, many)) {
            return 2;
        }
        printf("system calls a block, %d blocks of %zu bytes:\n", blocks, block);
        double lookups = 0;
        for (const auto& [name, count] : many) {
            const double rate = static_cast<double>(count - few[name]) / blocks;
            const auto limit = allowed.find(name);
            const bool lookup = name.find("stat") != std::string::npos;
            lookups += lookup ? rate : 0;
            const bool good = lookup ? lookups <= 1.0 + 0.01
                                     : rate <= (limit == allowed.end() ? 0 : limit->second + 0.01);
            within = within && good;
            if (count != few[name]) {
                printf("  %-14s %7.3f%s\n", name.c_str(), rate, good ? "" : "  too many");
            }
        }
    }
    printf("%s\n", within ? "nothing but what each block must cost" : "MISSED");
    return within ? 0 : 1;
}
