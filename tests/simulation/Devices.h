// SPDX-License-Identifier: Apache-2.0
// The other ends of the device files that the service opens: log devices, which give the
// coded streams, and diag devices, which answer requests well, slowly, wrongly or never. Each
// open gets a socket pair of its own. Belongs to one life of the service: a stream goes on,
// when its device is opened again, with the first byte that was not read.
#ifndef SIMULATION_DEVICES_H_
#define SIMULATION_DEVICES_H_

#include <stddef.h>
#include <stdint.h>

#include <deque>
#include <string>
#include <utility>
#include <vector>

#include "simulation/Calls.h"

class Devices {
public:
    static bool is_device(const std::string& path);

    // A device of that class, with the end that is ours: the service's descriptor.
    static int open_pair(FdClass cls, int* peer);
    // The service opens a device: its descriptor, or -1 with errno.
    int open(const std::string& path);
    // Moves bytes and answers on, as far as the time has come.
    void pump();
    // When the next answer is due; INT64_MAX when there is none.
    int64_t next_due() const;

    void feed(unsigned stream, uint64_t bytes);
    // The service has taken what it wants of the DSP's memory: the rest is dropped.
    void dump_confirmed(int fd);
    // Whether a read of it gives nothing: what was announced has been read.
    static bool dump_ends() {
        const StreamState& s = g_state->streams[ST_DUMP];
        return s.fed == s.consumed && s.answers % 2 == 0;
    }
    // Reads fail until the device is opened again.
    void fail(unsigned stream);
    void pull(unsigned stream);
    // What the service has to have in a file of the last exchange: null when its answer was not
    // a whole one.
    const std::string* whole_answer(unsigned stream) const {
        return m_whole[stream] && m_log[stream].answers.empty() && m_diag[stream].answers.empty()
                   ? &m_answer[stream]
                   : nullptr;
    }
    // Bytes of the stream, which know no frames, came between those of the answer.
    void spoil_answer(unsigned stream) { m_whole[stream] = false; }
    // The external chip sends its memory unasked.
    void push_memory(unsigned stream, uint64_t seed);
    // The service read so many bytes from the stream's log device, which carries answers as
    // well: how many of them were the stream's.
    size_t log_bytes(unsigned stream, size_t len);

private:
    struct Piece {
        int64_t due;
        std::vector<uint8_t> bytes;
    };
    struct End {
        int fd = -1;    // the service's
        int peer = -1;  // ours
        uint64_t sent = 0;
        // What is on its way, in order: pieces of the stream and of answers.
        std::deque<std::pair<bool, size_t>> on_the_way;
        std::vector<uint8_t> requests;
        std::deque<Piece> answers;
    };

    static int open_end(End& end, FdClass cls, unsigned stream);
    static void drop(End& end);
    void pump_stream(unsigned stream);
    static void pump_answers(End& end);
    void take_requests(End& end, unsigned stream);
    void answer(End& end, unsigned stream, uint8_t type, bool dump);

    End m_log[STREAM_COUNT];
    End m_diag[STREAM_COUNT];
    std::string m_answer[STREAM_COUNT];
    bool m_whole[STREAM_COUNT] = {};
};

#endif  // SIMULATION_DEVICES_H_
