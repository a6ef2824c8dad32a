// SPDX-License-Identifier: Apache-2.0
// Buffers of I/Q samples are captured while the logs go on.
#include <sys/stat.h>

#include <algorithm>
#include <filesystem>
#include <map>

#include "sim/DemoStage.h"
#include "sim/WriteClock.h"
#include "sim/scenes/scenes.h"

namespace fs = std::filesystem;

namespace {

const unsigned QUOTA_MB = 512;    // captures are never deleted: they have to fit
const unsigned FULL_RATE = 8000;  // KB/s from each CP while the large buffer is saved
const double STALL_MS = 1000;
const uint32_t MB = 1 << 20;

struct Buffer {
    uint32_t offset;
    uint32_t len;
};

std::string size_text(uint32_t len) {
    return len % MB == 0 ? std::to_string(len / MB) + " MiB" : std::to_string(len) + " bytes";
}

// The directory that the CP's log goes to at present.
std::string current_dir(DemoStage& stage, const SimCp& cp) {
    std::error_code ec;
    std::string newest;
    fs::file_time_type time = fs::file_time_type::min();
    for (const std::string& path : stage.files(cp, "0-", ".log")) {
        const auto written = fs::last_write_time(path, ec);
        if (!ec && written > time) {
            time = written;
            newest = fs::path(path).parent_path().string();
        }
    }
    return newest;
}

// The captures by what they are on the medium: one of the same second takes over the name.
std::map<ino_t, std::string> captures(DemoStage& stage, const SimCp& cp) {
    std::map<ino_t, std::string> found;
    for (const std::string& path : stage.files(cp, cp.name + "_wiq_", ".bin")) {
        struct stat st;
        if (stat(path.c_str(), &st) == 0) {
            found[st.st_ino] = path;
        }
    }
    return found;
}

// Announces the samples, waits until they are saved and checks the file.
bool capture(DemoStage& stage, const Buffer& buffer, uint32_t seed) {
    SimIqDevice& iq = stage.handset().iq_memory();
    SimCp& cp = stage.modem();
    const auto earlier = captures(stage, cp);
    const unsigned released = iq.released();
    bool good = iq.announce(buffer.offset, buffer.len) &&
                stage.wait_until([&] { return iq.released() > released; }, 30);
    std::vector<std::string> fresh;
    for (const auto& [file, path] : captures(stage, cp)) {
        if (earlier.count(file) == 0) {
            fresh.push_back(path);
        }
    }
    bool same = false;
    good = good && fresh.size() == 1 &&
           stage.wait_for([&] { same = SimIqDevice::holds_samples(fresh[0], buffer.len, seed); });
    return stage.check(good && same, (fresh.size() == 1 ? fs::path(fresh[0]).filename().string()
                                                        : std::to_string(fresh.size()) + " files") +
                                         ": the buffer of " + size_text(buffer.len) + " at " +
                                         std::to_string(buffer.offset) + ", byte for byte");
}

// With the logs at their full rate; measures whether they have to wait for the save.
void capture_large(DemoStage& stage, const Buffer& buffer, uint32_t seed) {
    SimIqDevice& iq = stage.handset().iq_memory();
    stage.wait_for([&] { iq.write_samples(buffer.offset, buffer.len, seed); });
    stage.set_rate(FULL_RATE);
    stage.say("Now " + size_text(buffer.len) + ", with " + std::to_string(FULL_RATE) +
              " KB/s from each CP");
    stage.wait(0.3);
    WriteClock clock;
    stage.check(clock.start({current_dir(stage, stage.modem()),
                             current_dir(stage, *stage.handset().cp("cp_gnss"))}),
                "the writes to the logs of the modem and the GNSS receiver are watched");
    const int64_t watched = WriteClock::now_ns();
    stage.wait(0.5);
    const int64_t announced = WriteClock::now_ns();
    const bool captured = capture(stage, buffer, seed);
    clock.stop();
    stage.set_rate(0);
    if (!captured) {
        return;
    }
    const double before_ms = clock.gap(watched, announced).largest_ms;
    const WriteClock::Gap gap = clock.gap(iq.taken_ns(), iq.released_ns());
    const double save_ms = static_cast<double>(iq.released_ns() - iq.taken_ns()) / 1e6;
    char text[200];
    snprintf(text, sizeof text,
             "the logs went on: saving took %.0f ms, %u or more writes to each log meanwhile, "
             "largest gap between two %.1f ms (%.1f ms before)",
             save_ms, gap.writes, gap.largest_ms, before_ms);
    // Were the loop to wait for the save, there would be none meanwhile. Where there were gaps
    // like that before the save, the machine is too busy to tell.
    const bool busy = before_ms >= std::min(save_ms, STALL_MS);
    stage.check(busy || (gap.writes > 0 && gap.largest_ms < STALL_MS), text);
}

}  // namespace

void play_iq_capture(DemoStage& stage) {
    SimIqDevice& iq = stage.handset().iq_memory();
    stage.say("A client has I/Q samples of the modem captured");
    stage.expect("SET_DATA_MAX_SIZE " + std::to_string(QUOTA_MB), "OK");
    stage.logs().set_quota("internal", QUOTA_MB);
    stage.expect("ENABLE_IQ WCDMA WCDMA", "OK");
    stage.expect("DISABLE_LOG WCDMA", "OK");
    stage.expect("ENABLE_LOG WCDMA", "OK");
    if (!stage.check(stage.wait_until([&] { return iq.in_use(); }, 5),
                     "the I/Q memory is in use since the modem's log has started anew")) {
        return;
    }
    uint32_t seed = 1;
    for (const Buffer& buffer :
         {Buffer{0, MB}, Buffer{5 * MB + 12345, 25 * MB}, Buffer{128 * MB - 77777, 77777}}) {
        stage.wait_for([&] { iq.write_samples(buffer.offset, buffer.len, seed); });
        capture(stage, buffer, seed++);
    }
    capture_large(stage, Buffer{0, 128 * MB}, seed);
    stage.expect("DISABLE_IQ WCDMA", "OK");
    stage.check(!iq.in_use() && iq.wrong_requests() == 0,
                "the I/Q memory is out of use and got no request out of turn");
}
