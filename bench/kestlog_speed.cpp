// SPDX-License-Identifier: Apache-2.0
// kestlog's commands on a log of a GiB of diag frames, beside cat, which only reads it. What they
// write goes to /dev/null.
#include <stdio.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>

#include "bench/OldLogs.h"
#include "bench/Options.h"
#include "bench/Samples.h"
#include "bench/Table.h"
#include "bench/common.h"
#include "sim/ChildProcess.h"
#include "sim/DiagFrame.h"

namespace {

constexpr int ROUNDS = 3;  // each takes seconds

// The bytes of frames of many sizes, with bytes that have to be escaped among them.
std::string frames(size_t size) {
    std::string bytes;
    for (uint32_t number = 0; bytes.size() < size; ++number) {
        DiagFrame frame;
        frame.sequence = number;
        frame.type = 0x98;
        for (uint32_t i = 0; i < 40 + number * 37 % 400; ++i) {
            frame.payload.push_back(static_cast<uint8_t>(i * 7 + number));
        }
        const std::vector<uint8_t> encoded = frame.encode();
        bytes.append(encoded.begin(), encoded.end());
    }
    return bytes;
}

struct Program {
    std::vector<std::string> args;
    std::string name;
    Samples cpu;
    Samples speed;
};

bool run(Program& program, double bytes) {
    ChildProcess process;
    const double start = now();
    if (!process.start({program.args, "/dev/null", "", false, {}, -1}) || !process.wait() ||
        process.status() != 0) {
        fprintf(stderr, "bench: %s: %s\n", program.name.c_str(), process.status_text().c_str());
        return false;
    }
    program.speed.add(bytes / 1e6 / (now() - start));
    program.cpu.add((process.cost().user_s + process.cost().system_s) * static_cast<double>(GIB) /
                    bytes);
    return true;
}

}  // namespace

Outcome measure_kestlog(const Options& options, const std::string& dir) {
    const std::string kestlog = options.built("kestlog");
    if (access(kestlog.c_str(), X_OK) < 0) {
        fail("run", kestlog);
        return NOT_MEASURED;
    }
    const OldLogs logs(dir + "/modem_log", "2016-03-01-09-15-00", "cp_gnss", 1, 0);
    const std::string part = frames(4 * MIB);
    {
        std::ofstream out(logs.path(0), std::ios::binary);
        for (uint64_t written = 0; written < options.scaled(1024) * MIB; written += part.size()) {
            out << part;
        }
    }
    const double bytes = static_cast<double>(std::filesystem::file_size(logs.path(0)));
    const std::string root = dir + "/modem_log";
    std::vector<Program> programs = {{{"cat", logs.path(0)}, "cat", {}, {}}};
    const std::vector<std::string> commands[] = {{"verify", root},
                                                 {"frames", logs.path(0)},
                                                 {"join", root},
                                                 {"export", root, "-o", "-"},
                                                 {"report", root, "-o", "-"}};
    for (const std::vector<std::string>& command : commands) {
        Program program{{kestlog}, "kestlog " + command[0], {}, {}};
        program.args.insert(program.args.end(), command.begin(), command.end());
        programs.push_back(program);
    }
    const int rounds = std::min(options.rounds, ROUNDS);
    for (int round = 0; round <= rounds; ++round) {
        progress("kestlog", round, rounds);
        for (Program& program : programs) {
            if (round == 1) {
                program.cpu = program.speed = Samples();
            }
            if (!run(program, bytes)) {
                return NOT_MEASURED;
            }
        }
    }
    Table table("Reading " + number_text(bytes / static_cast<double>(MIB)) + " MiB of diag frames",
                {"program", "CPU s/GiB", "least", "x cat", "MB/s", "x cat's"});
    for (const Program& program : programs) {
        table.add_row({program.name, number_text(program.cpu.median(), 2),
                       number_text(program.cpu.least(), 2),
                       number_text(program.cpu.over(programs[0].cpu).median(), 1),
                       number_text(program.speed.median()),
                       number_text(program.speed.over(programs[0].speed).median(), 2)});
    }
    return table.print();
}
