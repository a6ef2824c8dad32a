// SPDX-License-Identifier: Apache-2.0
// What the floor of the log path consists of: each of its calls alone, and how often the floor
// makes it for a GiB. What is left of its CPU time is the change between writer and reader, and
// the loop itself.
#include <fcntl.h>
#include <poll.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <unistd.h>

#include <map>
#include <vector>

#include "bench/FloorLog.h"
#include "bench/LogProgram.h"
#include "bench/Options.h"
#include "bench/Samples.h"
#include "bench/Table.h"
#include "bench/common.h"
#include "bench/feeding.h"
#include "sim/files.h"

namespace {

constexpr size_t BLOCK = 32768;  // of a read
constexpr int CALLS = 1000;      // of each kind

// The median CPU time in microseconds of one call, that of looking at the clock included;
// prepare() is called before each.
template <typename Prepare, typename Call>
double clocked_us(int calls, Prepare prepare, Call call) {
    Samples times;
    for (int i = 0; i < calls; ++i) {
        prepare(i);
        const double start = own_cpu();
        call(i);
        times.add((own_cpu() - start) * 1e6);
    }
    return times.median();
}

void nothing(int /*i*/) {}

// The call alone.
template <typename Prepare, typename Call>
double median_us(int calls, Prepare prepare, Call call) {
    static const double clock_us = clocked_us(CALLS, nothing, nothing);
    return clocked_us(calls, prepare, call) - clock_us;
}

// Times of calls in microseconds, by the names that the floor counts.
typedef std::map<std::string, double> Costs;

void measure_input(Costs& costs) {
    const std::vector<uint8_t> data = log_text(BLOCK);
    std::vector<uint8_t> buffer(BLOCK);
    int fds[2];
    if (pipe(fds) < 0) {
        fail("make", "a pipe");
        return;
    }
    const auto read_block = [&](size_t size) {
        return median_us(
            CALLS, [&](int) { write_all(fds[1], data.data(), size); },
            [&](int) { size = static_cast<size_t>(read(fds[0], buffer.data(), buffer.size())); });
    };
    costs["read"] = read_block(1);
    costs["copied"] = read_block(BLOCK) - costs["read"];
    write_all(fds[1], data.data(), 1);
    struct pollfd input = {fds[0], POLLIN, 0};
    costs["poll"] = median_us(CALLS, nothing, [&](int) { poll(&input, 1, -1); });
    close(fds[0]);
    close(fds[1]);
}

// In the directory, which is as deep as that of the service's logs.
void measure_files(const std::string& dir, Costs& costs) {
    const std::vector<uint8_t> data = log_text(FloorLog::STAGING);
    std::vector<uint8_t> staging(FloorLog::STAGING);
    const unsigned files = KEPT_MIB / FILE_MIB;
    const int pieces = static_cast<int>(FILE_MIB * MIB / FloorLog::STAGING);
    const auto path = [&](int number) {
        return FloorLog::file_path(dir, static_cast<unsigned>(number));
    };
    int fd = -1;
    costs["open"] = median_us(
        static_cast<int>(files), [&](int) { close(fd); },
        [&](int i) { fd = open(path(i).c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0644); });
    close(fd);
    costs["staged"] =
        median_us(CALLS, nothing, [&](int) { memcpy(staging.data(), data.data(), BLOCK); });
    const struct iovec halves[] = {{staging.data(), BLOCK},
                                   {const_cast<uint8_t*>(data.data()), FloorLog::STAGING - BLOCK}};
    costs["written"] = median_us(
        static_cast<int>(files) * pieces,
        [&](int i) {
            if (i % pieces == 0) {
                fd = open(path(i / pieces).c_str(), O_WRONLY | O_CLOEXEC);
            }
        },
        [&](int i) {
            if (writev(fd, halves, 2) < 0 || i % pieces == pieces - 1) {
                close(fd);
            }
        });
    struct stat st;
    const std::string newest = path(0);
    costs["stat"] = median_us(CALLS, nothing, [&](int) { stat(newest.c_str(), &st); });
    costs["access"] = median_us(CALLS, nothing, [&](int) { access(newest.c_str(), R_OK | W_OK); });
    costs["rename"] = median_us(static_cast<int>(files), nothing,
                                [&](int i) { rename(path(i).c_str(), path(i + 1000).c_str()); });
    costs["unlink"] =
        median_us(static_cast<int>(files), nothing, [&](int i) { unlink(path(i + 1000).c_str()); });
}

// How often the floor makes each call for a GiB, and its CPU time, "total", in microseconds.
bool count_calls(const Options& options, const std::string& dir, size_t block,
                 std::map<std::string, double>& counts) {
    const double gib = static_cast<double>(options.mib * MIB) / static_cast<double>(GIB);
    const LogProgram floor = log_programs(options)[0];
    Samples total;
    for (int round = 0; round <= options.rounds; ++round) {
        progress("floor, writes of " + std::to_string(block), round, options.rounds);
        const LogRun run = floor.run(dir, options.mib, block);
        if (!run.ok) {
            return false;
        }
        total.add((run.cost.user_s + run.cost.system_s) * 1e6 / gib);
    }
    const std::string messages = read_text_file(dir + "/messages");
    char name[16];
    double count;
    int used;
    for (const char* at = messages.c_str(); sscanf(at, "%15s %lf%n", name, &count, &used) == 2;
         at += used) {
        counts[name] = count / gib;
    }
    counts["staged"] /= BLOCK;
    counts["copied"] = static_cast<double>(GIB) / BLOCK;
    counts["written"] = static_cast<double>(GIB) / FloorLog::STAGING;
    counts["total"] = total.median();
    return true;
}

}  // namespace

Outcome measure_floor_calls(const Options& options, const std::string& dir) {
    const struct {
        const char* name;
        const char* words;
    } rows[] = {{"poll", "poll of a ready FIFO"},
                {"read", "read: the call"},
                {"copied", "read: copying 32 KiB out of the FIFO"},
                {"stat", "stat: a look at the properties"},
                {"access", "access: is the file still there?"},
                {"staged", "copying 32 KiB into the staging buffer"},
                {"written", "writev of 64 KiB into new pages of a file"},
                {"open", "open of a new file"},
                {"rename", "rename of a file"},
                {"unlink", "unlink of a file of 5 MiB"}};
    const size_t blocks[] = {32768, 512};
    std::map<std::string, double> counts[2];
    Costs costs;
    for (size_t i = 0; i < 2; ++i) {
        if (!count_calls(options, dir, blocks[i], counts[i])) {
            return NOT_MEASURED;
        }
    }
    const std::string logs = dir + "/h/data/modem_log/2016-03-01-09-15-00";
    if (mkdir((dir + "/h").c_str(), 0700) < 0 || mkdir((dir + "/h/data").c_str(), 0700) < 0 ||
        mkdir((dir + "/h/data/modem_log").c_str(), 0700) < 0 || mkdir(logs.c_str(), 0700) < 0) {
        fail("create", logs);
        return NOT_MEASURED;
    }
    measure_input(costs);
    measure_files(logs, costs);

    Table table("The floor, call by call",
                {"call", "us each", "32 KiB writes: a GiB", "ms", "512 byte writes: a GiB", "ms"});
    double left[2] = {counts[0]["total"], counts[1]["total"]};
    for (const auto& row : rows) {
        std::vector<std::string> cells = {row.words, number_text(costs[row.name], 2)};
        for (size_t i = 0; i < 2; ++i) {
            const double us = counts[i][row.name] * costs[row.name];
            left[i] -= us;
            cells.push_back(number_text(counts[i][row.name]));
            cells.push_back(number_text(us / 1000));
        }
        table.add_row(cells);
    }
    table.add_row({"changes between writer and reader, the rest", "", "",
                   number_text(left[0] / 1000), "", number_text(left[1] / 1000)});
    table.add_row({"the floor's CPU time", "", "", number_text(counts[0]["total"] / 1000), "",
                   number_text(counts[1]["total"] / 1000)});
    return table.print();
}
