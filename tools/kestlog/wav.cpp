// SPDX-License-Identifier: Apache-2.0
// kestlog wav.
#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include <algorithm>
#include <memory>
#include <nlohmann/json.hpp>

#include "common/text.h"
#include "kestlog/ChunkSequence.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/OutputFile.h"
#include "kestlog/Problems.h"
#include "kestlog/Progress.h"
#include "kestlog/StreamPlan.h"
#include "kestlog/TempDir.h"
#include "kestlog/TreeInput.h"
#include "kestlog/WavFile.h"
#include "kestlog/option_numbers.h"

namespace {

// A larger gap is not filled: a wrong sequence number must not become hours of silence.
constexpr uint64_t MAX_SILENCE_SECONDS = 60;
constexpr uint64_t MAX_ALL_SILENCE_SECONDS = 60 * 60;  // damage may look like any number of gaps

struct Sound {
    const WavFormat* format;
    int rate;
    int channels;
    bool fill_gaps;
};

bool read_number(const CommandLine& line, const char* option, int most, int* number, int* status) {
    uint64_t value;
    if (!line.has(option)) {
        *status = line.usage_error("--" + std::string(option) + " is missing");
        return false;
    }
    if (!read_whole(line, option, 1, static_cast<uint64_t>(most), &value, status)) {
        return false;
    }
    *number = static_cast<int>(value);
    return true;
}

bool read_sound(const CommandLine& line, Sound* sound, int* status) {
    sound->format = find_wav_format(line.value("format", ""));
    sound->fill_gaps = line.has("fill-gaps");
    if (!check_word(line, "format", wav_format_names(), status)) {
        return false;
    }
    if (!line.has("output")) {
        *status = line.usage_error("-o FILE is missing");
        return false;
    }
    if (!read_number(line, "rate", 9999999, &sound->rate, status) ||
        !read_number(line, "channels", WavFile::MAX_CHANNELS, &sound->channels, status)) {
        return false;
    }
    const uint64_t frame = static_cast<uint64_t>(sound->channels) * sound->format->bytes;
    if (frame * static_cast<uint64_t>(sound->rate) > UINT32_MAX) {
        *status = line.usage_error("a WAV file cannot have 4 GiB of sound a second");
        return false;
    }
    return true;
}

struct Input {
    PlannedFile planned;
    bool named;  // given as a FILE
};

// The files of the audio DSP's log in a tree, and FILEs of any name.
std::vector<Input> choose_files(const LogTree& tree, const std::vector<LogStream>& streams) {
    std::vector<Input> inputs;
    for (const LogStream& stream : streams) {
        if (cp_type_of(stream.cp) != CT_AGDSP) {
            continue;
        }
        const std::vector<PlannedFile> plan = plan_stream(stream);
        for (size_t i = 0; i < plan.size(); ++i) {
            inputs.push_back({plan[i], stream.files[i].set->given});
        }
    }
    for (const TreeSet& set : tree.sets) {
        for (const TreeCp& cp : set.cps) {
            for (const TreeFile& file : cp.files) {
                if (set.given && (!file.name.is_log() || file.name.cp_type != CT_AGDSP)) {
                    inputs.push_back({{&file, false, false, {}}, true});
                }
            }
        }
    }
    return inputs;
}

class Recorder {
public:
    Recorder(const CommandLine& line, const Sound& sound, OutputFile* out)
        : m_sound(sound),
          m_out(*out),
          m_problems(line.has("json"), out->is_standard() ? stderr : stdout) {}

    // What has no position is written at once in the end.
    bool open() {
        const bool apart = m_out.is_standard() || lseek(fileno(m_out.stream()), 0, SEEK_CUR) < 0;
        const int nameless = apart ? TempDir::open_file() : -1;
        m_apart.reset(nameless >= 0 ? fdopen(nameless, "w+") : nullptr);
        FILE* const file = apart ? m_apart.get() : m_out.stream();
        if (!file) {
            failure(ES_OUTPUT, TempDir::parent() + ": " + strerror(errno));
            return false;
        }
        return good(m_wav.open(fileno(file), *m_sound.format, m_sound.rate, m_sound.channels));
    }

    bool take(const Input& input) {
        const TreeFile& file = *input.planned.file;
        const std::string path = file.shown();
        if (!input.named) {
            m_problems.add(path, input.planned.findings);
        }
        LogReader in;
        if (input.planned.left_out) {
            return true;
        }
        if (!in.open(file.path(), input.named)) {
            m_problems.unreadable(path, errno);
            return true;
        }
        if (!is_chunked(in, file.name)) {
            m_problems.unreadable(path + ": not a log of the audio DSP");
            return true;
        }
        FileReport report;
        bool ok = true;
        m_sequence.enter(*file.dir);
        scan_file(
            in, file.name,
            [&](const Piece& piece) {
                const int32_t missing = m_sequence.take(piece, &report);
                ok = gap(missing, m_sequence.anew()) &&
                     (piece.kind != CHUNK_KINDS[CK_PCM] || sound(piece));
                return ok;
            },
            FP_LENGTH, &report);
        m_problems.add(path, report, in.error());
        return ok;
    }

    // The exit status, with the result printed.
    int finish() {
        m_dropped += m_wav.drop_unfinished();
        if (!good(m_wav.close())) {
            return ES_OUTPUT;
        }
        if (m_chunks == 0 || (m_wav.frames() == 0 && m_dropped > 0)) {
            const char* const what = m_chunks == 0 ? "found no PCM chunks" : "no sample is whole";
            return std::max(m_problems.status(), failure(ES_UNREADABLE, what));
        }
        uint64_t copied;
        int error = 0;
        if ((m_apart && (lseek(fileno(m_apart.get()), 0, SEEK_SET) < 0 ||
                         !m_out.copy_from(fileno(m_apart.get()), UINT64_MAX, &copied, &error))) ||
            error != 0 || !m_out.close()) {
            return m_out.failed();
        }
        print();
        return m_problems.status();
    }

private:
    bool good(bool result) const {
        if (!result) {
            failure(ES_OUTPUT, m_out.path() + ": " + m_wav.error());
        }
        return result;
    }

    bool sound(const Piece& piece) {
        ++m_chunks;
        m_last_len = piece.data_len;
        return good(m_wav.write(piece.data, piece.data_len));
    }

    // The missing chunks may be of any kind; to be filled they are taken for PCM chunks of the
    // size of the one before. Numbers that go back tell nothing.
    bool gap(int32_t missing, bool anew) {
        if (missing == 0 && !anew) {
            return true;
        }
        // What comes next, of another set perhaps, begins with the first channel.
        m_dropped += m_wav.drop_unfinished();
        m_gaps += missing != 0;
        const uint64_t frames =
            static_cast<uint64_t>(std::max(missing, 0)) * m_last_len / m_wav.frame_bytes();
        const auto rate = static_cast<uint64_t>(m_sound.rate);
        if (!m_sound.fill_gaps || frames == 0 || frames > MAX_SILENCE_SECONDS * rate ||
            m_silence + frames > MAX_ALL_SILENCE_SECONDS * rate) {
            return true;
        }
        ++m_filled;
        m_silence += frames;
        return good(m_wav.write_silence(frames));
    }

    void print() const {
        const double seconds = static_cast<double>(m_wav.frames()) / m_sound.rate;
        const double silence = static_cast<double>(m_silence) / m_sound.rate;
        if (m_problems.json()) {
            m_problems.print({{"output", json_text(m_out.path())},
                              {"chunks", m_chunks},
                              {"frames", m_wav.frames()},
                              {"seconds", seconds},
                              {"gaps", m_gaps},
                              {"gaps_filled", m_filled},
                              {"silence_frames", m_silence},
                              {"dropped_bytes", m_dropped},
                              {"damages", m_problems.damages()},
                              {"notes", m_problems.notes()}});
            return;
        }
        fprintf(m_out.is_standard() ? stderr : stdout,
                "%s: %.3f seconds of %llu chunks; %llu gaps, %llu of them filled with %.3f seconds "
                "of silence; %llu bytes of unfinished samples left out\n",
                escape_text(m_out.path()).c_str(), seconds,
                static_cast<unsigned long long>(m_chunks), static_cast<unsigned long long>(m_gaps),
                static_cast<unsigned long long>(m_filled), silence,
                static_cast<unsigned long long>(m_dropped));
    }

    struct Closer {
        void operator()(FILE* file) const { fclose(file); }
    };

    const Sound& m_sound;
    OutputFile& m_out;
    Problems m_problems;
    std::unique_ptr<FILE, Closer> m_apart;
    WavFile m_wav;
    ChunkSequence m_sequence;
    size_t m_last_len = 0;
    uint64_t m_chunks = 0;
    uint64_t m_gaps = 0;
    uint64_t m_filled = 0;
    uint64_t m_silence = 0;
    uint64_t m_dropped = 0;
};

}  // namespace

int run_wav(const CommandLine& line) {
    Sound sound;
    LogTree tree;
    int status;
    if (!read_sound(line, &sound, &status) || !takes_binary(line, &status) ||
        !open_tree(line, &tree, &status, LogTree::FILES_TOO)) {
        return status;
    }
    OutputFile out;
    if (!out.open(line.value("output", ""), line.has("force"))) {
        return out.failed();
    }
    Recorder recorder(line, sound, &out);
    if (!recorder.open()) {
        return ES_OUTPUT;
    }
    const Progress progress(0);
    for (const Input& input : choose_files(tree, log_streams(tree))) {
        if (!recorder.take(input)) {
            return ES_OUTPUT;
        }
    }
    status = recorder.finish();
    return std::max(status, tell_failures(tree));
}
