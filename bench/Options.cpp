// SPDX-License-Identifier: Apache-2.0

#include "bench/Options.h"

#include <linux/magic.h>
#include <stdlib.h>
#include <sys/statfs.h>
#include <unistd.h>

#include "bench/common.h"
#include "bench/measurements.h"
#include "sim/files.h"

std::string default_dir(const Options& options) {
    const uint64_t needed =
        (options.kept_mib ? 2 * options.kept_mib + 64 : options.mib + 256) * MIB;
    struct statfs info;
    if (statfs("/dev/shm", &info) == 0 && info.f_type == TMPFS_MAGIC &&
        info.f_bavail * static_cast<uint64_t>(info.f_bsize) >= needed &&
        access("/dev/shm", W_OK) == 0) {
        return "/dev/shm";
    }
    return temp_dir();
}

bool parse_options(int argc, char** argv, Options& options) {
    options.measurement = find_measurement(nullptr);
    for (int i = 1; i < argc; ++i) {
        const std::string arg = argv[i];
        if (const Measurement* asked = find_measurement(argv[i])) {
            options.measurement = asked;
            continue;
        }
        if (arg == "--spread") {
            options.spread = true;
            continue;
        }
        if (++i >= argc) {
            return false;
        }
        const char* value = argv[i];
        char* end;
        const unsigned long number = strtoul(value, &end, 10);
        const bool is_number = *value && !*end;
        if (arg == "--dir") {
            options.dir = value;
        } else if (arg == "--service") {
            options.service = value;
        } else if (arg == "--mib" && is_number && number > 0) {
            options.mib = number;
        } else if (arg == "--kept" && is_number) {
            options.kept_mib = number;
        } else if (arg == "--block" && is_number && number > 0) {
            options.block = number;
        } else if (arg == "--rounds" && is_number && number > 0 && number < 1000) {
            options.rounds = static_cast<int>(number);
        } else {
            return false;
        }
    }
    return true;
}
