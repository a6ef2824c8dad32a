// SPDX-License-Identifier: Apache-2.0
// A CP asserts: its memory and the crash records are saved, subscribers are told, and the
// log goes on when the CP is alive again.
#include "sim/DemoStage.h"
#include "sim/kernel_files.h"
#include "sim/scenes/scenes.h"

namespace {

using Diag = SimDiagResponder;

const size_t LAST_WORDS = 3000;

// One crash, with the parts that differ between the CPs.
struct Crash {
    SimCp& cp;
    Diag& diag;
    SimSupervisor& supervisor;
    const char* protocol_name;
    const char* mini_dump;  // the kernel's file
    const char* crash_text;
    const char* alive_text;
    bool pushes;  // sends its memory without being asked
};

struct CrashFile {
    std::string prefix;
    std::string suffix;
    std::vector<uint8_t> content;
    std::vector<std::string> earlier;
};

std::vector<CrashFile> expected_records(DemoStage& stage, const Crash& crash) {
    const KernelFileSizes sizes;
    std::vector<CrashFile> files = {
        {"mini_dump_", ".bin", kernel_file_content(crash.mini_dump, sizes.mini_dump), {}},
        {"smsg_", ".log", kernel_file_content("d/dipx/smsg", sizes.ipc_record), {}},
        {"sbuf_", ".log", kernel_file_content("d/dipx/sbuf", sizes.ipc_record), {}},
        {"sblock_", ".log", kernel_file_content("d/dipx/sblock", sizes.ipc_record), {}}};
    for (CrashFile& file : files) {
        file.earlier = stage.files(crash.cp, file.prefix, file.suffix);
    }
    return files;
}

// Shows how the dump gets on until it is all sent.
void follow_dump(DemoStage& stage, const Crash& crash, unsigned finished, size_t size) {
    for (size_t quarter = 1; quarter <= 4; ++quarter) {
        const size_t mark = size * quarter / 4;
        if (stage.wait_until(
                [&] {
                    return crash.diag.sent_size(Diag::DUMP) >= mark ||
                           crash.diag.finished(Diag::DUMP) > finished;
                },
                10)) {
            stage.say("  dump: " + std::to_string(crash.diag.sent_size(Diag::DUMP) >> 10) +
                      " KB sent");
        }
    }
}

void play_crash(DemoStage& stage, const Crash& crash) {
    SimCp& cp = crash.cp;
    const std::string name = crash.protocol_name;
    const unsigned finished = crash.diag.finished(Diag::DUMP);
    Diag::Plan plan;
    plan.mode = stage.unhurried() ? Diag::SLOW : Diag::ANSWER;
    plan.size = 512 << 10;
    plan.gap_ms = 10;
    crash.diag.set_plan(Diag::DUMP, plan);

    if (!stage.check(stage.wait_until([&] { return crash.supervisor.connected(); }, 5),
                     "the service is connected to the supervisor")) {
        return;
    }
    stage.expect("SUBSCRIBE " + name + " DUMP", "OK");
    stage.expect("ENABLE_MD", "OK");
    stage.set_quotas(false);
    std::vector<CrashFile> records = expected_records(stage, crash);
    const auto earlier_dumps = stage.files(cp, cp.name + "_memory_", ".dmp");

    // A crashed CP says nothing more; what it said before is still read.
    cp.running = false;
    stage.wait_until([&] { return cp.log.pending() == 0; }, 3);
    if (crash.pushes) {
        stage.wait(0.2);  // a device that the log and the dump share has to be empty
    }
    stage.say(std::string("The supervisor announces: ") + crash.crash_text);
    crash.supervisor.send(crash.crash_text);
    bool good = stage.expect_notification("CP_DUMP_START " + name, 5);
    for (const CrashFile& file : records) {
        stage.check_new_file(cp, file.prefix, file.suffix, file.earlier, file.content);
    }
    if (good) {
        if (crash.pushes) {
            crash.diag.push_memory();
        }
        follow_dump(stage, crash, finished, plan.size);
        good = stage.expect_notification("CP_DUMP_END " + name, 10);
    }
    if (good) {
        stage.check_new_file(cp, cp.name + "_memory_", ".dmp", earlier_dumps,
                             crash.diag.file_content(Diag::DUMP));
        // Nobody reads the log device now: what is in it has to wait there.
        cp.feed(LAST_WORDS);
        stage.wait(stage.unhurried() ? 1 : 0.2);
        stage.check(cp.log.pending() == LAST_WORDS,
                    "the last " + std::to_string(LAST_WORDS) +
                        " bytes of the crashed CP wait in its device");
    }
    stage.say(std::string("The supervisor announces: ") + crash.alive_text);
    crash.supervisor.send(crash.alive_text);
    const bool read = stage.wait_until([&] { return cp.log.pending() == 0; }, 5);
    cp.running = true;
    const uint64_t position = cp.fed;
    stage.check(
        read && stage.wait_until([&] { return stage.logs().end_position(cp) > position; }, 5),
        cp.name + " logs again, from byte " + std::to_string(position) + " on");
    stage.set_quotas(true);
    stage.expect("DISABLE_MD", "OK");
    stage.expect("UNSUBSCRIBE " + name + " DUMP", "OK");
}

}  // namespace

void play_modem_crash(DemoStage& stage) {
    stage.say("The modem is going to crash");
    play_crash(stage, {stage.modem(), stage.modem_diag(), stage.modem_supervisor(), "WCDMA",
                       "proc/cpw/mini_dump", "Modem Assert: simulated", "Modem Alive", false});
}

void play_wcn_crash(DemoStage& stage) {
    stage.say("The connectivity chip is going to crash");
    play_crash(stage, {stage.wcn(), stage.wcn_diag(), stage.wcn_supervisor(), "WCN",
                       "proc/cptl/mini_dump", "WCN-EXTERNAL-DUMP", "WCN-EXTERNAL-ALIVE", true});
}
