// SPDX-License-Identifier: Apache-2.0

#include "bench/Options.h"

#include <linux/magic.h>
#include <stdlib.h>
#include <sys/statfs.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "bench/common.h"
#include "bench/tables.h"
#include "sim/files.h"

namespace fs = std::filesystem;

namespace {

constexpr uint64_t ROOM = 2048 * MIB;  // more than any table takes

// A tmpfs with room, or the usual place.
std::string default_dir() {
    struct statfs info;
    if (statfs("/dev/shm", &info) == 0 && info.f_type == TMPFS_MAGIC &&
        info.f_bavail * static_cast<uint64_t>(info.f_bsize) >= ROOM &&
        access("/dev/shm", W_OK) == 0) {
        return "/dev/shm";
    }
    return temp_dir();
}

bool take_value(const std::string& option, const char* value, Options& options) {
    char* end;
    const unsigned long number = strtoul(value, &end, 10);
    const bool positive = *value && !*end && number > 0;
    if (option == "--dir") {
        options.dir = value;
    } else if (option == "--service") {
        options.service = value;
    } else if (option == "--mib" && positive) {
        options.mib = number;
    } else if (option == "--rounds" && positive && number < 1000) {
        options.rounds = static_cast<int>(number);
    } else {
        return false;
    }
    return true;
}

}  // namespace

std::string Options::built(const char* name) const {
    std::error_code error;
    return fs::read_symlink("/proc/self/exe", error).replace_filename(name).string();
}

bool parse_options(int argc, char** argv, Options& options) {
    for (int i = 1; i < argc; ++i) {
        const std::string arg = argv[i];
        if (const TableMaker* table = find_table(arg)) {
            options.tables.push_back(table);
        } else if (arg == "--spread") {
            options.spread = true;
        } else if (arg == "--quick") {
            options.quick = true;
            options.mib = std::min<uint64_t>(options.mib, 64);
            options.rounds = 1;
        } else if (++i >= argc || !take_value(arg, argv[i], options)) {
            return false;
        }
    }
    if (options.tables.empty()) {
        options.tables = default_tables();
    }
    if (options.dir.empty()) {
        options.dir = default_dir();
    }
    if (options.service.empty()) {
        options.service = options.built("kestmodem");
    }
    return true;
}
