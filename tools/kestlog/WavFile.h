// SPDX-License-Identifier: Apache-2.0
// A WAV file that grows by samples as they come, in pieces that may end within a sample. Larger
// than 4 GiB it becomes an RF64 file.
#ifndef KESTLOG_WAVFILE_H_
#define KESTLOG_WAVFILE_H_

#include <sndfile.h>
#include <stddef.h>
#include <stdint.h>

#include <string>
#include <vector>

struct WavFormat {
    const char* name;
    int wav_format;  // of libsndfile
    size_t bytes;    // of a sample
    bool swapped;    // big-endian, which a WAV file is not
};

// Null when there is none of that name.
const WavFormat* find_wav_format(const std::string& name);
std::vector<std::string> wav_format_names();

class WavFile {
public:
    static constexpr int MAX_CHANNELS = 1024;

    WavFile() = default;
    ~WavFile() { close(); }
    WavFile(const WavFile&) = delete;
    WavFile& operator=(const WavFile&) = delete;

    // Each is false on failure; error() then tells why. The descriptor of an empty file that can
    // be positioned stays the caller's.
    bool open(int fd, const WavFormat& format, int rate, int channels);
    bool write(const uint8_t* data, size_t len);
    bool write_silence(uint64_t frames);
    bool close();
    // Drops the beginning of a frame that will not be continued; the bytes.
    size_t drop_unfinished();

    uint64_t frames() const { return m_frames; }
    size_t frame_bytes() const { return m_frame_bytes; }
    const std::string& error() const { return m_error; }

private:
    bool put(uint8_t* data, size_t len);
    bool fail(const char* words);

    SNDFILE* m_file = nullptr;
    const WavFormat* m_format = nullptr;
    size_t m_frame_bytes = 0;  // a sample of each channel
    uint64_t m_frames = 0;
    std::vector<uint8_t> m_pending;  // less than a frame
    std::string m_error;
};

#endif  // KESTLOG_WAVFILE_H_
