// SPDX-License-Identifier: Apache-2.0
// The audio DSP logs, delivers PCM data and asserts; all of it goes into one log.
#include <algorithm>
#include <cmath>
#include <filesystem>

#include "sim/DemoStage.h"
#include "sim/DspLogCheck.h"
#include "sim/scenes/scenes.h"

namespace fs = std::filesystem;

namespace {

std::vector<uint8_t> stream_bytes(uint8_t id, size_t len) {
    std::vector<uint8_t> bytes(len);
    SimStream(id).fill(0, bytes.data(), len);
    return bytes;
}

// A scale: 16-bit samples of 16 kHz, little-endian.
std::vector<uint8_t> music(size_t len) {
    const int NOTES[] = {0, 2, 4, 5, 7, 9, 11, 12};  // halftones
    const size_t NOTE_LEN = 6250;                    // samples
    const double SECOND = 16000;
    std::vector<uint8_t> bytes;
    for (size_t n = 0; bytes.size() < len; ++n) {
        const double pitch = 440 * std::pow(2, NOTES[n / NOTE_LEN % std::size(NOTES)] / 12.0);
        const double fade = 1 - static_cast<double>(n % NOTE_LEN) / NOTE_LEN;
        const double phase = 2 * std::acos(-1.0) * pitch * static_cast<double>(n) / SECOND;
        const int value = static_cast<int>(20000 * fade * std::sin(phase));
        bytes.push_back(static_cast<uint8_t>(value));
        bytes.push_back(static_cast<uint8_t>(value >> 8));
    }
    return bytes;
}

// Feeds the next piece; true when nothing is left.
bool feed_piece(SimLogDevice& device, const std::vector<uint8_t>& bytes, size_t* done,
                size_t piece) {
    const ssize_t n = device.feed(bytes.data() + *done, std::min(piece, bytes.size() - *done));
    *done += n > 0 ? static_cast<size_t>(n) : 0;
    return *done == bytes.size();
}

// The DSP's log files, in the order in which they were written.
std::vector<std::string> log_files(DemoStage& stage) {
    const auto number = [](const fs::path& path) { return std::stoul(path.filename().string()); };
    std::vector<std::string> paths = stage.cp_files("agdsp", "", ".log");
    std::sort(paths.begin(), paths.end(), [&](const fs::path& a, const fs::path& b) {
        return a.parent_path() != b.parent_path() ? a.parent_path() < b.parent_path()
                                                  : number(a) > number(b);
    });
    return paths;
}

}  // namespace

void play_audio_dsp(DemoStage& stage) {
    SimDspDevice& dsp = stage.handset().audio_dsp();
    const size_t piece = 4321;  // that the DSP writes at a time
    const auto log = stream_bytes(0xD0, 300000);
    const auto pcm = music(200000);
    stage.say("The audio DSP logs and delivers PCM data");
    size_t log_done = 0;
    size_t pcm_done = 0;
    stage.wait_until(
        [&] {
            const bool all_log = feed_piece(dsp.log(), log, &log_done, piece);
            const bool all_pcm = feed_piece(dsp.pcm(), pcm, &pcm_done, piece / 2);
            return all_log && all_pcm && dsp.log().pending() == 0 && dsp.pcm().pending() == 0;
        },
        10);
    std::vector<uint8_t> dumps;
    for (size_t size : {size_t{600000}, size_t{77}}) {
        stage.say("The audio DSP asserts, its memory of " + std::to_string(size) +
                  " bytes is there to be read");
        const auto memory = stream_bytes(static_cast<uint8_t>(size), size);
        dumps.insert(dumps.end(), memory.begin(), memory.end());
        const unsigned taken = dsp.dumps_taken();
        stage.check(dsp.crash(memory) &&
                        stage.wait_until([&] { return dsp.dumps_taken() > taken; }, 5) &&
                        dsp.unread() == 0,
                    "the service has read it to its end and says so");
    }
    stage.check(dsp.wrong_requests() == 0, "the dump device got no request out of turn");
    // The last dump has left nothing in the service's buffer.
    DspLogCheck check;
    for (const std::string& path : log_files(stage)) {
        check.add_file(path);
    }
    stage.check(check.chunks() > 0 && check.damages() == 0,
                std::to_string(check.chunks()) + " chunks with good headers, numbered in sequence" +
                    (check.damages() > 0 ? ", but " + check.first_damage() : ""));
    stage.check(check.data(DspSource::LOG) == log && check.data(DspSource::PCM) == pcm &&
                    check.data(DspSource::DUMP) == dumps,
                "they hold " + std::to_string(log.size()) + " bytes of log, " +
                    std::to_string(pcm.size()) + " of PCM data and " +
                    std::to_string(dumps.size()) + " of dumps, as they were sent");
}
