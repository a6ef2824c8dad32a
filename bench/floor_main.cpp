// SPDX-License-Identifier: Apache-2.0
// The floor of the log path: the cheapest loop that makes the calls which copying a log stream
// needs. Reads standard input to its end and prints how many calls of each kind it made.
// usage: kestbench_floor DIR
#include <fcntl.h>
#include <poll.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <vector>

#include "bench/FloorLog.h"
#include "bench/common.h"

namespace fs = std::filesystem;

int main(int argc, char** argv) {
    if (argc != 2) {
        fprintf(stderr, "usage: kestbench_floor DIR\n");
        return 2;
    }
    // Paths as deep as the service's: each look-up has to follow them.
    const std::string root = fs::absolute(argv[1]).lexically_normal().string();
    const std::string dir = root + "/data/modem_log/2016-03-01-09-15-00/cp_gnss";
    const std::string properties = root + "/default.prop";
    fs::create_directories(dir);
    std::ofstream(properties) << "init.svc.fuse_sdcard0=stopped\n";
    std::vector<uint8_t> block(32768);
    unsigned long polls = 0;
    unsigned long reads = 0;
    {
        FloorLog log(dir, FILE_MIB * MIB, KEPT_MIB * MIB);
        fcntl(STDIN_FILENO, F_SETFL, O_NONBLOCK);
        for (struct pollfd input = {STDIN_FILENO, POLLIN, 0};;) {
            ++polls;
            poll(&input, 1, -1);
            ++reads;
            const ssize_t n = read(STDIN_FILENO, block.data(), block.size());
            if (n <= 0) {
                break;
            }
            struct stat st;
            stat(properties.c_str(), &st);
            log.write(block.data(), static_cast<size_t>(n));
        }
        const FloorLog::Calls& calls = log.calls();
        printf("poll %lu\nread %lu\nstat %lu\naccess %lu\nstaged %lu\n", polls, reads, reads,
               calls.access, calls.staged);
        printf("writev %lu\nopen %lu\nrename %lu\nunlink %lu\n", calls.writev, calls.open,
               calls.rename, calls.unlink);
    }
    return 0;
}
