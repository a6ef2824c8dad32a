// SPDX-License-Identifier: Apache-2.0

#include "bench/LogProgram.h"

#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>

#include "bench/common.h"
#include "bench/feeding.h"
#include "bench/process_figures.h"
#include "sim/files.h"

namespace fs = std::filesystem;

namespace {

const char CAT_FILE[] = "/log";

// cat writes one file: what is old becomes a hole in it.
void punch_hole(const std::string& dir, uint64_t fed_mib) {
    if (fed_mib % FILE_MIB == 0 && fed_mib > KEPT_MIB) {
        const int fd = open((dir + CAT_FILE).c_str(), O_WRONLY | O_CLOEXEC);
        fallocate(fd, FALLOC_FL_PUNCH_HOLE | FALLOC_FL_KEEP_SIZE, 0,
                  static_cast<off_t>((fed_mib - KEPT_MIB) * MIB));
        close(fd);
    }
}

void remove_oldest(const std::string& dir, uint64_t fed_mib) {
    if (fed_mib % FILE_MIB == 0 && fed_mib > KEPT_MIB) {
        char name[16];
        snprintf(name, sizeof(name), "/x%05u",
                 static_cast<unsigned>((fed_mib - KEPT_MIB) / FILE_MIB - 1));
        unlink((dir + name).c_str());
    }
}

// What the files take on the file system; holes do not count.
uint64_t bytes_kept(const std::string& dir) {
    uint64_t bytes = 0;
    std::error_code error;
    for (const auto& entry : fs::recursive_directory_iterator(dir, error)) {
        struct stat st;
        if (lstat(entry.path().c_str(), &st) == 0 && S_ISREG(st.st_mode)) {
            bytes += static_cast<uint64_t>(st.st_blocks) * 512;
        }
    }
    return bytes;
}

// Programs keep the quota more or less exactly.
bool check_kept(const LogProgram& program, const std::string& dir, uint64_t mib) {
    const uint64_t kept = bytes_kept(dir);
    const uint64_t wanted = std::min<uint64_t>(mib, KEPT_MIB) * MIB;
    const uint64_t tolerance = 2 * FILE_MIB * MIB;
    if (kept + tolerance < wanted || kept > wanted + tolerance) {
        fprintf(stderr, "bench: the files of %s hold %llu bytes, not about %llu\n", program.name,
                static_cast<unsigned long long>(kept), static_cast<unsigned long long>(wanted));
        return false;
    }
    return true;
}

}  // namespace

std::vector<LogProgram> log_programs(const Options& options) {
    const std::string size = std::to_string(FILE_MIB * MIB);
    const std::string files = std::to_string(KEPT_MIB / FILE_MIB);
    return {
        {"floor", nullptr, options.built("kestbench_floor") + " .", nullptr},
        {"cat", nullptr, "cat >." + std::string(CAT_FILE), punch_hole},
        {"split", nullptr, "split -b " + size + " -d -a 5", remove_oldest},
        {"s6-log", "s6", "s6-log n" + files + " s" + size + " .", nullptr},
        // Its configuration is a file; its usual buffer of 1 KiB would slow it down.
        {"svlogd", "runit", "svlogd -b 65536 .", nullptr},
        {"multilog", "daemontools", "multilog n" + files + " s" + size + " .", nullptr},
        {"rotatelogs", "apache2-utils",
         "rotatelogs -n " + files + " log " + std::to_string(FILE_MIB) + "M", nullptr},
    };
}

bool LogProgram::installed() const {
    return !package || system(("command -v " + std::string(name) + " >/dev/null").c_str()) == 0;
}

LogRun LogProgram::run(const std::string& dir, uint64_t mib, size_t block) const {
    LogRun run;
    const TempDir work(dir, "p");
    const std::string fifo = work.path() + "/fifo";
    const std::string logs = work.path() + "/logs";
    if (mkfifo(fifo.c_str(), 0600) < 0 || mkdir(logs.c_str(), 0700) < 0) {
        fail("create", fifo);
        return run;
    }
    std::ofstream(logs + "/config")
        << "s" << FILE_MIB * MIB << "\nn" << KEPT_MIB / FILE_MIB << "\n";
    ChildProcess reader;
    const std::string line = "cd '" + logs + "' && exec " + command + " <../fifo";
    if (!reader.start({{"sh", "-c", line}, dir + "/messages", "", false, {}, -1})) {
        fail("start", name);
        return run;
    }
    const int fd = open_writer(fifo, reader);
    if (fd < 0) {
        return run;
    }
    const double start = now();
    run.ok = feed(fd, mib * MIB, block, [&](uint64_t fed) {
        const double before = own_cpu();
        if (trim) {
            trim(logs, fed);
        }
        run.deleting_s += own_cpu() - before;
    });
    run.peak_kib = process_status(reader.pid(), "VmHWM");
    close(fd);
    run.ok = reader.wait() && reader.status() == 0 && run.ok;
    run.wall_s = now() - start;
    run.cost = reader.cost();
    if (!run.ok) {
        fprintf(stderr, "bench: %s failed: %s\n%s", name, reader.status_text().c_str(),
                read_text_file(dir + "/messages").c_str());
    }
    run.ok = run.ok && check_kept(*this, logs, mib);
    return run;
}
