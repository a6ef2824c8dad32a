// SPDX-License-Identifier: Apache-2.0

#include "simulation/Ledger.h"

#include <string.h>
#include <sys/stat.h>

#include <algorithm>
#include <fstream>
#include <vector>

#include "simulation/Calls.h"
#include "simulation/CodedStream.h"
#include "simulation/State.h"

namespace {

constexpr size_t RECORD_LEN = 16;
const uint8_t RECORD_MAGIC[] = {0x78, 0x56, 0x34, 0x12};
constexpr size_t CHUNK_HEADER_LEN = 20;
// What the last byte of a chunk's header tells, by stream.
constexpr uint8_t CHUNK_KINDS[STREAM_COUNT] = {0, 0, 0, 0x40, 0x43, 0x42};
// Bytes of something else may go on like a stream by chance, but not more than these.
constexpr uint64_t CHANCE = 8;
// A slice of fewer bytes may hold no whole word of the stream.
constexpr size_t LOCATABLE = 15;

// Whether the stream has to be read now, for certain.
bool is_logged(unsigned stream) {
    const Setting& logged = g_state->streams[std::min<unsigned>(stream, ST_DSP)].logged;
    return logged.value && !logged.uncertain;
}

void gap(unsigned stream, uint64_t to) {
    StreamState& s = g_state->streams[stream];
    const uint64_t len = to - s.written;
    trace("lost %s %llu bytes at %llu", STREAM_NAMES[stream], number(len), number(s.written));
    const uint64_t excused = s.written > s.excuse_until ? 0 : s.excuse;
    if (len > excused + s.unplaced) {
        fail_run("lost", "%s: %llu bytes lost at %llu; explained are %llu up to %llu",
                 STREAM_NAMES[stream], number(len), number(s.written), number(s.excuse),
                 number(s.excuse_until));
    }
    s.excuse -= std::min(len, s.excuse);
    s.unplaced = 0;
    s.written = to;
}

// How many bytes, too few to tell, lie within a gap in front of some that can be placed: between
// two exchanges, which read what the device has. 0 when there are none.
size_t short_slice(unsigned stream, const uint8_t* data, size_t len) {
    const StreamState& s = g_state->streams[stream];
    for (size_t n = 1; n < LOCATABLE && n < len; ++n) {
        uint64_t position;
        if (coded_stream::locate(stream, data + n, len - n, &position)) {
            return s.written + n <= position && position <= s.consumed ? n : 0;
        }
    }
    return 0;
}

// Bytes of the stream that reached a file.
void take(unsigned stream, const uint8_t* data, size_t len, bool removed) {
    StreamState& s = g_state->streams[stream];
    s.stored += len;
    s.removed += removed ? len : 0;
    while (len > 0) {
        size_t same = coded_stream::match(
            stream, s.written, data,
            static_cast<size_t>(std::min<uint64_t>(len, s.consumed - s.written)));
        if (s.answers_logged > 0 && same < CHANCE && same < len) {
            same = 0;  // as good as chance
        }
        s.written += same;
        data += same;
        len -= same;
        if (len == 0) {
            break;
        }
        uint64_t position;
        if (s.answers_logged > 0 &&
            (len < LOCATABLE || !coded_stream::locate(stream, data, len, &position))) {
            --s.answers_logged;
            ++s.unplaced;
            ++data;
            --len;
            continue;
        }
        if (len < LOCATABLE || !coded_stream::locate(stream, data, len, &position)) {
            if (len < LOCATABLE && s.written + len <= s.consumed) {
                // Too short to tell: somewhere behind a gap.
                trace("%s: %zu bytes that cannot be placed", STREAM_NAMES[stream], len);
                s.unplaced += len;
                return;
            }
            if (const size_t n = short_slice(stream, data, len)) {
                s.unplaced += n;
                data += n;
                len -= n;
                continue;
            }
            fail_run("foreign",
                     "%s: %zu bytes behind %llu are not the stream's: %02x %02x %02x %02x ...",
                     STREAM_NAMES[stream], len, number(s.written), data[0], data[1], data[2],
                     data[3]);
        }
        if (position + CHANCE > s.consumed) {
            break;  // not read yet
        }
        if (position < s.written && s.written - position <= CHANCE && s.answers_seen) {
            s.written = position;  // the last bytes before were an answer's
            continue;
        }
        if (position < s.written) {
            fail_run("twice", "%s: bytes of %llu are written once more at %llu",
                     STREAM_NAMES[stream], number(position), number(s.written));
        }
        gap(stream, position);
    }
    if (len > 0 || s.written > s.consumed) {
        fail_run("foreign", "%s: %zu bytes behind %llu are written, read only up to %llu",
                 STREAM_NAMES[stream], len, number(s.written), number(s.consumed));
    }
    if (s.written > s.excuse_until) {
        s.excuse = 0;
    }
}

bool is_chunk_header(const uint8_t* data, size_t len) {
    return len >= CHUNK_HEADER_LEN && memcmp(data, "~~~~", 4) == 0 && data[8] == 0x5a &&
           data[9] == 0x5a;
}

void take_chunks(FdInfo& file, const uint8_t* data, size_t len) {
    if (len >= 4 && memcmp(data, "~~~~", 4) == 0 &&
        (file.payload_left > 0 || file.header_len > 0)) {
        // A full medium cut the last chunk off.
        trace("%s: chunk cut off", STREAM_NAMES[file.stream]);
        for (unsigned stream : ledger::streams_in(file.stream)) {
            ++g_state->streams[stream].cuts;
        }
        file.payload_left = file.header_len = 0;
    }
    while (len > 0) {
        if (file.payload_left > 0) {
            const size_t n = std::min(len, file.payload_left);
            const uint8_t* const kind =
                std::find(CHUNK_KINDS + ST_DSP, std::end(CHUNK_KINDS), file.header[19]);
            if (kind == std::end(CHUNK_KINDS)) {
                fail_run("foreign", "agdsp: a chunk of kind %02x", file.header[19]);
            }
            take(static_cast<unsigned>(kind - CHUNK_KINDS), data, n, file.removed);
            file.payload_left -= n;
            data += n;
            len -= n;
            continue;
        }
        file.header[file.header_len++] = *data++;
        --len;
        if (file.header_len == CHUNK_HEADER_LEN) {
            file.header_len = 0;
            file.payload_left = static_cast<size_t>(file.header[4] | file.header[5] << 8) - 16;
            if (memcmp(file.header, "~~~~", 4) != 0 || file.payload_left > 65535) {
                fail_run("foreign", "agdsp: no chunk where one has to begin");
            }
        }
    }
}

// Bytes that reached a file, without the time record that may head it.
size_t skip_record(FdInfo& file, const uint8_t* data, size_t len) {
    if (file.stream == ST_DSP || file.position >= RECORD_LEN) {
        return 0;
    }
    if (file.position == 0) {
        file.has_record = memcmp(data, RECORD_MAGIC, std::min(len, sizeof(RECORD_MAGIC))) == 0;
        // In the calm, nothing is in the way of the record.
        if (!file.has_record && file.stream == ST_WCDMA && file.opened_in_calm) {
            fail_run("record", "a log file of the modem has no time record");
        }
    }
    return file.has_record ? std::min<size_t>(len, static_cast<size_t>(RECORD_LEN - file.position))
                           : 0;
}

struct Bytes {
    const uint8_t* data;
    size_t size;
};

// For how many bytes a header that begins there goes on until another one begins: 0 when it is
// whole.
size_t cut_header(const Bytes& bytes, size_t at) {
    for (size_t len = 4; len < CHUNK_HEADER_LEN && at + len < bytes.size; ++len) {
        if (is_chunk_header(bytes.data + at + len, bytes.size - at - len)) {
            return len;
        }
    }
    return 0;
}

// Whether a chunk begins there, be it one that a full medium cut off within its header.
bool chunk_begins(const Bytes& bytes, size_t at) {
    return bytes.size - at >= 4 && memcmp(bytes.data + at, "~~~~", 4) == 0 &&
           (is_chunk_header(bytes.data + at, bytes.size - at) || cut_header(bytes, at) > 0 ||
            bytes.size - at < CHUNK_HEADER_LEN);
}

// Valid until the next call.
Bytes chunk_payload(const Bytes& bytes, uint8_t kind) {
    static std::vector<uint8_t> payload;
    payload.clear();
    for (size_t at = 0; at < bytes.size;) {
        if (!is_chunk_header(bytes.data + at, bytes.size - at)) {
            ++at;  // the rest of a header that was cut off
            continue;
        }
        if (const size_t cut = cut_header(bytes, at)) {
            at += cut;
            continue;
        }
        const size_t len = static_cast<size_t>(bytes.data[at + 4] | bytes.data[at + 5] << 8) - 16;
        const bool wanted = bytes.data[at + 19] == kind;
        const size_t from = at + CHUNK_HEADER_LEN;
        const size_t end = std::min(from + len, bytes.size);
        // What follows tells that the chunk is whole, though it may end like the next one begins.
        const bool whole =
            from + len <= bytes.size &&
            memcmp(bytes.data + end, "~~~~", std::min<size_t>(bytes.size - end, 4)) == 0;
        at = whole ? end : from;
        while (at < end && !chunk_begins(bytes, at)) {
            const void* const flag = memchr(bytes.data + at + 1, '~', end - at - 1);
            at = flag ? static_cast<size_t>(static_cast<const uint8_t*>(flag) - bytes.data) : end;
        }
        if (wanted) {
            payload.insert(payload.end(), bytes.data + from, bytes.data + at);
        }
    }
    return {payload.data(), payload.size()};
}

// Of a whole file. Valid until the next call: after every step all files are read, and their
// bytes would be in new memory each time.
Bytes file_bytes(const std::string& path) {
    static std::vector<uint8_t> buffer;
    std::ifstream file(path, std::ios::binary | std::ios::ate);
    const auto size = file ? static_cast<size_t>(file.tellg()) : 0;
    if (size > buffer.size()) {
        buffer.resize(size);
    }
    file.seekg(0);
    file.read(reinterpret_cast<char*>(buffer.data()), static_cast<std::streamsize>(size));
    return {buffer.data(), static_cast<size_t>(file.gcount())};
}

// The stream's bytes of a whole log file. Valid until the next call.
Bytes stream_part(const std::string& path, unsigned stream) {
    const Bytes all = file_bytes(path);
    const uint8_t kind = CHUNK_KINDS[stream];
    // Of a record that a full medium cut off, there may be less than its mark.
    const bool has_record =
        !kind && all.size > 0 &&
        memcmp(all.data, RECORD_MAGIC, std::min(all.size, sizeof(RECORD_MAGIC))) == 0;
    const size_t begin = has_record ? std::min(RECORD_LEN, all.size) : 0;
    const Bytes bytes = {all.data + begin, all.size - begin};
    return kind ? chunk_payload(bytes, kind) : bytes;
}

}  // namespace

namespace ledger {

void excuse(unsigned stream) {
    StreamState& s = g_state->streams[stream];
    s.excuse = s.consumed - s.written;
    s.excuse_until = s.consumed;
}

void excuse_all() {
    for (unsigned stream = 0; stream < STREAM_COUNT; ++stream) {
        excuse(stream);
    }
}

void excuse_kill() {
    for (unsigned stream = 0; stream < STREAM_COUNT; ++stream) {
        StreamState& s = g_state->streams[stream];
        const uint64_t open = s.consumed - s.written;
        if (open > STAGED_AND_BLOCK + s.excuse) {
            fail_run("lost", "%s: %llu bytes were not on the medium when the service was killed",
                     STREAM_NAMES[stream], number(open));
        }
        excuse(stream);
    }
}

void consumed(unsigned stream, size_t len, bool diverted) {
    StreamState& s = g_state->streams[stream];
    s.consumed += len;
    g_state->counters.bytes += len;
    if (diverted) {
        excuse(stream);
    }
    const uint64_t open = s.consumed - s.written;
    if (open > STAGED_AND_BLOCK + s.excuse) {
        fail_run("lost", "%s: %llu bytes read and not written", STREAM_NAMES[stream], number(open));
    }
}

void answer_logged(unsigned stream, size_t len) {
    g_state->counters.bytes += len;
    // As many of the stream's own bytes in front of it may be taken for the answer's.
    g_state->streams[stream].answers_logged += len + LOCATABLE;
    g_state->streams[stream].answers_seen = true;
}

void file_written(FdInfo& file, const uint8_t* data, size_t len) {
    const size_t record = skip_record(file, data, len);
    file.position += len;
    data += record;
    len -= record;
    if (file.stream == ST_DSP) {
        take_chunks(file, data, len);
    } else {
        take(file.stream, data, len, file.removed);
    }
}

std::vector<unsigned> streams_in(unsigned channel) {
    return channel == ST_DSP ? std::vector<unsigned>{ST_DSP, ST_PCM, ST_DUMP}
                             : std::vector<unsigned>{channel};
}

void file_removed(const std::string& path, unsigned channel) {
    for (unsigned stream : streams_in(channel)) {
        g_state->streams[stream].removed += stream_part(path, stream).size;
    }
    struct stat st;
    if (stat(path.c_str(), &st) != 0) {
        return;
    }
    for (FdInfo& info : g_fds) {
        if (info.cls == FD_LOG_FILE && info.inode == st.st_ino) {
            info.removed = true;
            for (unsigned stream : streams_in(channel)) {
                excuse(stream);  // what is staged for it may go with it
            }
        }
    }
}

void check_written(unsigned stream) {
    const StreamState& s = g_state->streams[stream];
    const uint64_t open = s.consumed - s.written;
    if (open > (s.written > s.excuse_until ? 0 : s.excuse) + s.unplaced) {
        fail_run("lost", "%s: %llu bytes read and not written at the end", STREAM_NAMES[stream],
                 number(open));
    }
}

void check_read() {
    for (unsigned stream = 0; stream < STREAM_COUNT; ++stream) {
        const StreamState& s = g_state->streams[stream];
        if (is_logged(stream) && s.fed != s.consumed) {
            fail_run("stopped", "%s: %llu bytes wait in the device", STREAM_NAMES[stream],
                     number(s.fed - s.consumed));
        }
    }
}

void check_settled() {
    check_read();
    for (unsigned stream = 0; stream < STREAM_COUNT; ++stream) {
        const StreamState& s = g_state->streams[stream];
        const uint64_t open = s.consumed - s.written;
        check_written(stream);
        if (is_logged(stream) && open > 0) {
            fail_run("stopped", "%s: the last bytes, in calm, are not in a file",
                     STREAM_NAMES[stream]);
        }
    }
}

uint64_t stream_bytes(const std::string& path, unsigned stream) {
    const Bytes bytes = stream_part(path, stream);
    uint64_t next = 0;
    for (size_t at = 0; at < bytes.size;) {
        uint64_t position;
        if (!coded_stream::locate(stream, bytes.data + at, bytes.size - at, &position)) {
            if (bytes.size - at < LOCATABLE) {
                break;
            }
            ++at;  // a slice too short to tell
            continue;
        }
        if (position + CHANCE < next) {
            fail_run("order", "%s: bytes of %llu behind %llu", path.c_str(), number(position),
                     number(next));
        }
        const size_t same = coded_stream::match(stream, position, bytes.data + at, bytes.size - at);
        at += same;
        next = position + same;
    }
    return bytes.size;
}

}  // namespace ledger
