// SPDX-License-Identifier: Apache-2.0
// Measures the log path: the same bytes go through a FIFO to the service, to cat and to
// split -b 5M in turn, and the CPU time of each, start and end included, is compared.
//
// The three are treated alike: the same writer, files on the same file system, and the
// same amount of data kept. The service deletes its old files itself and pays for that;
// for cat (which writes one file) and split the benchmark deletes what is old from its
// own process and shows what that cost. So there are two ratios: to the CPU time of cat,
// which the aim is about, and to cat with its deletions, which is work for work. The
// GNSS channel is used, whose files begin with no time record.
//
// Writer and reader share one CPU: on two, what the reader's copies cost depends on which
// caches the data is in, and the ratio is different in every round (--spread shows it).
#include <sched.h>
#include <stdio.h>
#include <sys/stat.h>

#include <algorithm>
#include <vector>

#include "bench/Options.h"
#include "bench/common.h"
#include "bench/log_readers.h"

namespace {

constexpr double TARGET = 1.15;  // CPU of the service relative to cat

double median(std::vector<double> values) {
    std::sort(values.begin(), values.end());
    const size_t half = values.size() / 2;
    return values.size() % 2 ? values[half] : (values[half - 1] + values[half]) / 2;
}

}  // namespace

int measure_log_path(const Options& options, const std::string& dir) {
    const struct {
        const char* name;
        Result (*run)(const Options&, const std::string&);
    } readers[] = {{"cat", run_cat}, {"split", run_split}, {"kestmodem", run_service}};
    constexpr size_t READERS = 3;

    if (!options.spread) {
        cpu_set_t one;
        CPU_ZERO(&one);
        CPU_SET(sched_getcpu(), &one);
        sched_setaffinity(0, sizeof(one), &one);
    }
    printf("%llu MiB through a FIFO in writes of %zu bytes, files of %llu MiB in %s, ",
           static_cast<unsigned long long>(options.mib), options.block,
           static_cast<unsigned long long>(FILE_MIB), options.dir.c_str());
    if (options.kept_mib) {
        printf("%llu MiB kept\n", static_cast<unsigned long long>(options.kept_mib));
    } else {
        printf("everything kept\n");
    }
    if (mkfifo((dir + "/fifo").c_str(), 0600) < 0) {
        fail("create", dir + "/fifo");
        return 2;
    }
    printf("%-6s%-10s%8s%8s%8s%10s%8s%11s%8s%8s%8s%10s\n", "round", "reader", "user s", "sys s",
           "cpu s", "delete s", "x cat", "x cat+del", "MB/s", "reads", "writes", "KiB/read");
    std::vector<double> cpu[READERS];
    std::vector<double> ratio[READERS];
    std::vector<double> work_ratio[READERS];
    // Round 0 warms up memory and caches and does not count.
    for (int round = 0; round <= options.rounds; ++round) {
        Result cat;
        for (size_t i = 0; i < READERS; ++i) {
            const Result r = readers[i].run(options, dir);
            if (!r.ok) {
                fprintf(stderr, "bench_log_path: %s failed\n", readers[i].name);
                return 2;
            }
            if (i == 0) {
                cat = r;
            }
            const double to_cat = r.cpu() / cat.cpu();
            const double to_work = r.with_deleting() / cat.with_deleting();
            const double size = static_cast<double>(options.mib * MIB);
            printf("%-6s%-10s%8.3f%8.3f%8.3f%10.3f%8.3f%11.3f%8.0f%8llu%8llu%10.1f\n",
                   round ? std::to_string(round).c_str() : "warm", readers[i].name, r.cost.user_s,
                   r.cost.system_s, r.cpu(), r.deleting, to_cat, to_work, size / 1e6 / r.wall,
                   static_cast<unsigned long long>(r.cost.reads),
                   static_cast<unsigned long long>(r.cost.writes),
                   size / 1024 / static_cast<double>(std::max<uint64_t>(r.cost.reads, 1)));
            fflush(stdout);
            if (round > 0) {
                cpu[i].push_back(r.cpu());
                ratio[i].push_back(to_cat);
                work_ratio[i].push_back(to_work);
            }
        }
    }
    for (size_t i = 0; i < READERS; ++i) {
        printf("median %-10s %.3f s of CPU, %.3f x cat, %.3f x cat with its deletions\n",
               readers[i].name, median(cpu[i]), median(ratio[i]), median(work_ratio[i]));
    }
    const bool within = median(ratio[READERS - 1]) <= TARGET;
    printf("%s: the aim is %.2f x cat\n", within ? "within the aim" : "MISSED", TARGET);
    return within ? 0 : 1;
}
