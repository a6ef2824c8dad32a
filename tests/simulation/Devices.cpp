// SPDX-License-Identifier: Apache-2.0

#include "simulation/Devices.h"

#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>

#include "sim/DiagFrame.h"
#include "simulation/Chance.h"
#include "simulation/CodedStream.h"
#include "simulation/World.h"

namespace {

const char* const LOG_PATHS[STREAM_COUNT] = {"/sim/wcdma_log",     "/sim/wcn",
                                             "/sim/gnss",          "/dev/audio_dsp_log",
                                             "/dev/audio_dsp_pcm", "/dev/audio_dsp_mem"};
const char* const DIAG_PATHS[STREAM_COUNT] = {"/sim/wcdma_diag", "", "", "", "", ""};

enum Answers : uint8_t { WELL, WELL_TOO, SLOWLY, REFUSING, WRONGLY, NEVER, CUT_OFF, ANSWERS_COUNT };

std::vector<uint8_t> noise(Chance& chance, uint64_t len) {
    std::vector<uint8_t> bytes(static_cast<size_t>(len));
    for (uint8_t& byte : bytes) {
        byte = static_cast<uint8_t>(chance.next());
    }
    return bytes;
}

std::vector<uint8_t> frame(uint8_t type, uint8_t sub_type, std::vector<uint8_t> payload) {
    return DiagFrame{0, type, sub_type, std::move(payload)}.encode();
}

std::vector<uint8_t> text(const char* words) {
    return std::vector<uint8_t>(words, words + strlen(words));
}

}  // namespace

bool Devices::is_device(const std::string& path) {
    return path.compare(0, 5, "/sim/") == 0 || path.compare(0, 5, "/dev/") == 0;
}

int Devices::open(const std::string& path) {
    for (unsigned stream = 0; stream < STREAM_COUNT; ++stream) {
        const bool log = path == LOG_PATHS[stream];
        if (!log && path != DIAG_PATHS[stream]) {
            continue;
        }
        if (g_state->streams[stream].gone) {
            errno = ENODEV;
            return -1;
        }
        return open_end(log ? m_log[stream] : m_diag[stream], log ? FD_LOG_DEVICE : FD_DIAG_DEVICE,
                        stream);
    }
    errno = ENOENT;
    return -1;
}

int Devices::open_pair(FdClass cls, int* peer) {
    int pair[2];
    if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0, pair) < 0) {
        fail_run("simulation", "no socket pair: %s", strerror(errno));
    }
    // The number has to be the same each time: the lowest free one is the service's.
    const int fd = std::min(pair[0], pair[1]);
    *peer = std::max(pair[0], pair[1]);
    remember_fd(fd, cls, PLACE_DEVICE);
    return fd;
}

int Devices::open_end(End& end, FdClass cls, unsigned stream) {
    drop(end);
    end.fd = open_pair(cls, &end.peer);
    end.sent = g_state->streams[stream].consumed;
    g_fds[end.fd].stream = stream;
    return end.fd;
}

void Devices::drop(End& end) {
    if (end.peer >= 0) {
        close(end.peer);
    }
    end = End();
}

void Devices::feed(unsigned stream, uint64_t bytes) {
    // A device keeps so much for a reader that does not come.
    constexpr uint64_t MAX_WAITING = 256 << 10;
    StreamState& s = g_state->streams[stream];
    const uint64_t waiting = s.fed - s.consumed;
    s.fed += std::min(bytes, waiting < MAX_WAITING ? MAX_WAITING - waiting : 0);
    pump_stream(stream);
}

void Devices::fail(unsigned stream) {
    m_whole[stream] = false;
    for (End* end : {&m_log[stream], &m_diag[stream]}) {
        if (end->fd >= 0 &&
            (g_fds[end->fd].cls == FD_LOG_DEVICE || g_fds[end->fd].cls == FD_DIAG_DEVICE)) {
            g_fds[end->fd].failed = true;
        }
        drop(*end);
    }
}

void Devices::pull(unsigned stream) {
    g_state->streams[stream].gone = true;
    fail(stream);
}

void Devices::pump() {
    // One look at all: a read that finds nothing costs more.
    struct pollfd fds[STREAM_COUNT * 2];
    for (unsigned stream = 0; stream < STREAM_COUNT; ++stream) {
        fds[stream] = {m_log[stream].peer, POLLIN, 0};
        fds[STREAM_COUNT + stream] = {m_diag[stream].peer, POLLIN, 0};
    }
    poll(fds, STREAM_COUNT * 2, 0);
    for (unsigned i = 0; i < STREAM_COUNT * 2; ++i) {
        const unsigned stream = i % STREAM_COUNT;
        End& end = i < STREAM_COUNT ? m_log[stream] : m_diag[stream];
        if (fds[i].revents) {
            take_requests(end, stream);
        }
        if (end.peer >= 0) {
            pump_answers(end);
        }
    }
    for (unsigned stream = 0; stream < STREAM_COUNT; ++stream) {
        pump_stream(stream);
    }
}

void Devices::pump_stream(unsigned stream) {
    End& end = m_log[stream];
    StreamState& s = g_state->streams[stream];
    while (end.peer >= 0 && end.answers.empty() && end.sent < s.fed) {
        uint8_t bytes[16384];
        const size_t len = static_cast<size_t>(std::min<uint64_t>(sizeof(bytes), s.fed - end.sent));
        coded_stream::fill(stream, end.sent, bytes, len);
        const ssize_t n = send(end.peer, bytes, len, MSG_NOSIGNAL);
        if (n <= 0) {
            if (n < 0 && errno != EAGAIN) {
                drop(end);  // the service closed it
            }
            return;
        }
        end.sent += static_cast<uint64_t>(n);
        end.on_the_way.push_back({true, static_cast<size_t>(n)});
    }
}

void Devices::pump_answers(End& end) {
    while (!end.answers.empty() && end.answers.front().due <= g_state->boot_ns) {
        Piece& piece = end.answers.front();
        const ssize_t n = send(end.peer, piece.bytes.data(), piece.bytes.size(), MSG_NOSIGNAL);
        if (n < 0 && errno != EAGAIN) {
            return drop(end);
        }
        if (n > 0) {
            end.on_the_way.push_back({false, static_cast<size_t>(n)});
        }
        if (n < static_cast<ssize_t>(piece.bytes.size())) {
            piece.bytes.erase(piece.bytes.begin(), piece.bytes.begin() + std::max<ssize_t>(n, 0));
            piece.due = g_state->boot_ns + 10 * NS_PER_MS;  // the service does not read now
            return;
        }
        end.answers.pop_front();
    }
}

size_t Devices::log_bytes(unsigned stream, size_t len) {
    auto& on_the_way = m_log[stream].on_the_way;
    size_t logged = 0;
    while (len > 0 && !on_the_way.empty()) {
        auto& piece = on_the_way.front();
        const size_t n = std::min(len, piece.second);
        logged += piece.first ? n : 0;
        len -= n;
        piece.second -= n;
        if (piece.second == 0) {
            on_the_way.pop_front();
        }
    }
    return logged;
}

int64_t Devices::next_due() const {
    int64_t due = INT64_MAX;
    for (const End* ends : {m_log, m_diag}) {
        for (unsigned stream = 0; stream < STREAM_COUNT; ++stream) {
            if (!ends[stream].answers.empty()) {
                due = std::min(due, ends[stream].answers.front().due);
            }
        }
    }
    return due;
}

void Devices::take_requests(End& end, unsigned stream) {
    uint8_t bytes[512];
    ssize_t n;
    while ((n = recv(end.peer, bytes, sizeof(bytes), 0)) > 0) {
        end.requests.insert(end.requests.end(), bytes, bytes + n);
    }
    if (end.requests.size() >= 2 && memcmp(end.requests.data(), DUMP_REQUEST, 2) == 0) {
        end.requests.clear();
        answer(end, stream, 0, true);
        return;
    }
    DiagFrame request;
    while (DiagFrame::take(end.requests, &request)) {
        if (request.type == RING_BUFFER_TYPE || request.type == SLEEP_LOG_TYPE) {
            answer(end, stream, request.type, false);
        }
    }
}

void Devices::dump_confirmed(int fd) {
    StreamState& s = g_state->streams[ST_DUMP];
    trace("dump confirmed, %llu bytes unread", number(s.fed - s.consumed));
    g_state->dump_unconfirmed = false;
    uint8_t bytes[4096];
    while (recv(fd, bytes, sizeof(bytes), 0) > 0) {
    }
    s.fed = m_log[ST_DUMP].sent = s.consumed;
    m_log[ST_DUMP].on_the_way.clear();
}

// Plans the whole answer at once.
void Devices::answer(End& end, unsigned stream, uint8_t type, bool dump) {
    Chance chance(g_state->counters.calls, stream);
    const uint8_t how = g_state->streams[stream].answers % ANSWERS_COUNT;
    trace("asked for %02x, answers %u", type, how);
    int64_t due = g_state->boot_ns;
    end.answers.clear();
    m_answer[stream].clear();
    m_whole[stream] = how != WRONGLY && how != NEVER && how != CUT_OFF && (dump || how != REFUSING);
    auto add = [&end, &due](std::vector<uint8_t> bytes, int64_t pause_ms) {
        due += pause_ms * NS_PER_MS;
        end.answers.push_back({due, std::move(bytes)});
    };
    if (how == NEVER) {
        return;
    }
    if (how == REFUSING && !dump) {
        return add(frame(type, SUB_REFUSED, {}), 0);
    }
    const uint64_t frames = 1 + chance.below(20);
    for (uint64_t i = 0; i < frames; ++i) {
        const int64_t pause = how == SLOWLY ? static_cast<int64_t>(chance.below(2500)) : 0;
        const std::vector<uint8_t> payload = noise(chance, chance.below(3000));
        const std::vector<uint8_t> bytes = frame(dump ? 0x10 : type, SUB_DATA, payload);
        const std::vector<uint8_t>& kept = dump ? bytes : payload;
        m_answer[stream].append(kept.begin(), kept.end());
        add(bytes, pause);
    }
    if (how == CUT_OFF) {
        return;
    }
    if (how == WRONGLY) {
        add(noise(chance, 300), 1);
        add(frame(type, 0x33, noise(chance, 30)), 1);
        return;
    }
    const std::vector<uint8_t> end_of_it =
        dump ? frame(0x10, SUB_DATA, text(DUMP_END)) : frame(type, SUB_END, {});
    if (dump) {
        m_answer[stream].append(end_of_it.begin(), end_of_it.end());
    }
    add(end_of_it, 1);
}

void Devices::push_memory(unsigned stream, uint64_t seed) {
    End& end = m_log[stream];
    if (end.peer < 0) {
        return;
    }
    Chance chance(seed);
    int64_t due = g_state->boot_ns;
    const uint8_t how = g_state->streams[stream].answers % ANSWERS_COUNT;
    const uint64_t pieces = 1 + chance.below(20);
    for (uint64_t i = 0; i < pieces && how != NEVER; ++i) {
        due += static_cast<int64_t>(how == SLOWLY ? chance.below(2500) : 1) * NS_PER_MS;
        end.answers.push_back({due, noise(chance, 1 + chance.below(8000))});
    }
    if (how != NEVER && how != CUT_OFF) {
        end.answers.push_back({due + 5 * NS_PER_MS, text(CHIP_DUMP_END)});
    }
}
