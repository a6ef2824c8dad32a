// SPDX-License-Identifier: Apache-2.0

#include "bench/log_readers.h"

#include <fcntl.h>
#include <stdio.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include <vector>

#include "bench/BenchHandset.h"
#include "bench/common.h"
#include "bench/feeding.h"

namespace {

// cat and split end with the FIFO's end.
template <typename Trim>
Result run_tool(const Options& options, const std::string& dir,
                const std::vector<std::string>& args, const std::string& out, Trim trim) {
    Result result;
    ChildProcess reader;
    if (!reader.start({args, out, dir + "/err", false, {}, -1})) {
        fail("start", args[0]);
        return result;
    }
    const int fd = open_writer(dir + "/fifo", reader);
    if (fd < 0) {
        return result;
    }
    const double start = read_clock(CLOCK_MONOTONIC);
    const bool fed = feed(fd, options.mib * MIB, options.block, [&](uint64_t size) {
        const double before = read_clock(CLOCK_THREAD_CPUTIME_ID);
        trim(size);
        result.deleting += read_clock(CLOCK_THREAD_CPUTIME_ID) - before;
    });
    close(fd);
    result.ok = reader.wait() && reader.status() == 0 && fed;
    result.cost = reader.cost();
    result.wall = read_clock(CLOCK_MONOTONIC) - start;
    return result;
}

}  // namespace

Result run_cat(const Options& options, const std::string& dir) {
    const std::string out = dir + "/cat.out";
    const int file = open(out.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    Result result = run_tool(options, dir, {"cat", dir + "/fifo"}, out, [&](uint64_t fed) {
        if (options.kept_mib && fed > options.kept_mib * MIB) {
            fallocate(file, FALLOC_FL_PUNCH_HOLE | FALLOC_FL_KEEP_SIZE, 0,
                      static_cast<off_t>(fed - options.kept_mib * MIB));
        }
    });
    struct stat st;
    if (fstat(file, &st) < 0 || static_cast<uint64_t>(st.st_size) != options.mib * MIB) {
        result.ok = false;
    }
    close(file);
    unlink(out.c_str());
    return result;
}

Result run_split(const Options& options, const std::string& dir) {
    const std::string prefix = dir + "/x";
    uint64_t oldest = 0;
    auto remove_oldest = [&] {
        char name[16];
        snprintf(name, sizeof(name), "%05llu", static_cast<unsigned long long>(oldest));
        ++oldest;
        return unlink((prefix + name).c_str()) == 0;
    };
    const std::vector<std::string> args = {
        "split", "-b", std::to_string(FILE_MIB) + "M", "-d", "-a", "5", dir + "/fifo", prefix};
    const Result result = run_tool(options, dir, args, dir + "/out", [&](uint64_t fed) {
        if (options.kept_mib && fed / (FILE_MIB * MIB) > oldest + options.kept_mib / FILE_MIB) {
            remove_oldest();
        }
    });
    while (remove_oldest()) {
    }
    return result;
}

Result run_service(const Options& options, const std::string& dir) {
    Result result;
    const BenchHandset handset(dir, options.kept_mib);
    ServiceProcess service;
    const int fd = start_service({options.service}, handset, service);
    if (fd < 0) {
        return result;
    }
    const uint64_t size = options.mib * MIB;
    const double start = read_clock(CLOCK_MONOTONIC);
    if (feed(fd, size, options.block, [](uint64_t) {}) && wait_empty(fd, service)) {
        result.wall = read_clock(CLOCK_MONOTONIC) - start;
        // The last block is read but may not be stored yet.
        wait_idle(service, 20);
        result.ok = end(service) && handset.check_logs(size);
        result.cost = service.cost();
    }
    close(fd);
    return result;
}
