// SPDX-License-Identifier: Apache-2.0

#include "channels/AgDspLogHandler.h"

#include <errno.h>
#include <poll.h>
#include <string.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include "core/SavedErrno.h"
#include "core/TimerManager.h"
#include "core/log.h"
#include "core/system_paths.h"
#include "storage/CpStorage.h"

namespace {

// Tells the dump device that its content has been taken: write direction, type 'X',
// number 6, argument of 4 bytes.
constexpr unsigned long CMD_DUMP_COMPLETE = 0x40045806;

void complete_dump(int fd) {
    const SavedErrno dump_errno;
    ioctl(fd, CMD_DUMP_COMPLETE, 0);
}

// How long the driver may take for the next part of a dump, and a step of that time.
constexpr int DUMP_PATIENCE_MS = 3000;
constexpr int DUMP_STEP_MS = 10;
// More no dump has, in all, headers included, nor does it take so long: the loop serves nothing
// else meanwhile. What has much to give gets time for it: a medium takes at least so many bytes a
// millisecond.
constexpr uint64_t MAX_DUMP = 512u << 20;
constexpr int64_t MAX_DUMP_MS = 60000;
constexpr int64_t SLOWEST_MEDIUM = 4 << 10;
// In a row; a device whose every read is interrupted has failed.
constexpr int MAX_INTERRUPTIONS = 300;

// Lets a step of time pass. The first one ends with new data; a driver that goes on to have
// none may claim to be ready all the same.
void await_dump(int fd, bool first) {
    if (first) {
        struct pollfd device = {fd, POLLIN, 0};
        poll(&device, 1, DUMP_STEP_MS);
    } else {
        usleep(DUMP_STEP_MS * 1000);
    }
}

// The time that the dump takes. Without a clock it is not known: the size alone is limited then.
class DumpTime {
public:
    // Whether that was too much for len bytes of data.
    bool too_long(uint64_t len) {
        struct timespec now;
        if (!TimerManager::read_clock(now)) {
            return false;
        }
        if (!m_begun) {
            m_begun = true;
            m_begin = now;
        }
        return TimerManager::diff_ms(now, m_begin) >=
               MAX_DUMP_MS + static_cast<int64_t>(len) / SLOWEST_MEDIUM;
    }

private:
    bool m_begun = false;
    struct timespec m_begin = {};
};

}  // namespace

AgDspLogHandler::AgDspLogHandler(LogController* ctrl, Multiplexer* mux,
                                 const LogConfig::ConfigEntry* entry, StorageManager* stor_mgr)
    : LogPipeHandler(ctrl, mux, entry, stor_mgr),
      m_pcm_notifier(ctrl, mux, PATH_AGDSP_PCM),
      m_dump_notifier(ctrl, mux, PATH_AGDSP_MEM) {
    m_pcm_notifier.set_callback(this, notify_pcm);
    m_dump_notifier.set_callback(this, notify_dump);
}

int AgDspLogHandler::start() {
    const int result = start_logging();
    if (result < 0) {
        return result;
    }
    if (m_pcm_notifier.open() < 0) {
        err_log("start PCM notifier error");
    }
    if (m_dump_notifier.open() < 0) {
        err_log("start dump notifier error");
    }
    return 0;
}

int AgDspLogHandler::stop() {
    const int result = stop_logging();
    if (result < 0) {
        return result;
    }
    m_pcm_notifier.close();
    m_dump_notifier.close();
    return 0;
}

int AgDspLogHandler::start_dump(const struct tm& /*t*/) {
    return -1;
}

void AgDspLogHandler::fill_header(uint8_t* buffer, size_t n, DspLogType type) {
    const DspChunkHeader header = make_dsp_chunk_header(n, type, m_seq++);
    memcpy(buffer, &header, sizeof(header));
}

int AgDspLogHandler::write_chunk(size_t n, DspLogType type) {
    fill_header(s_io_buffer, n, type);
    const int len = static_cast<int>(n + DSP_CHUNK_HEADER_LEN);
    const int written = storage()->write(s_io_buffer, n + DSP_CHUNK_HEADER_LEN);
    if (written >= 0 && written < len) {
        info_log("%s save log: %d of %d bytes lost", name().string(), len - written, len);
    }
    return written;
}

void AgDspLogHandler::process(int /*events*/) {
    const ssize_t n = read(m_fd, s_io_buffer + DSP_CHUNK_HEADER_LEN, MAX_CHUNK);
    if (n < 0) {
        dev_read_failed();
        return;
    }
    if (n == 0) {
        err_log("AG-DSP log device driver bug: read returns 0");
        dev_gave_nothing();
        return;
    }
    note_alive();
    if (!storage() && create_storage() < 0) {
        return;
    }
    if (write_chunk(static_cast<size_t>(n), DLT_LOG) < 0) {
        err_log("%s save log error", name().string());
    }
}

void AgDspLogHandler::notify_pcm(FileNotifier* notifier, void* client) {
    static_cast<AgDspLogHandler*>(client)->save_audio_log(notifier, DLT_PCM);
}

void AgDspLogHandler::save_audio_log(FileNotifier* notifier, DspLogType type) {
    const ssize_t n = read(notifier->fd(), s_io_buffer + DSP_CHUNK_HEADER_LEN, MAX_CHUNK);
    if (n < 0) {
        if (errno == EAGAIN || errno == EINTR) {
            notifier->note_read(false);
        } else {
            err_log("read PCM device error");
            notifier->close();
        }
        return;
    }
    notifier->note_read(n > 0);
    if (!storage() && create_storage() < 0) {
        err_log("create CpStorage error");
        return;
    }
    if (write_chunk(static_cast<size_t>(n), type) < 0) {
        err_log("%s save log error", name().string());
    }
}

void AgDspLogHandler::notify_dump(FileNotifier* notifier, void* client) {
    AgDspLogHandler* handler = static_cast<AgDspLogHandler*>(client);
    info_log("AG-DSP %s assert", handler->name().string());
    handler->save_dump(notifier);
}

void AgDspLogHandler::save_dump(FileNotifier* notifier) {
    if (!storage() && create_storage() < 0) {
        complete_dump(notifier->fd());
        err_log("create AG-DSP CpStorage error");
        notifier->note_read(false);
        return;
    }
    bool stored = false;
    bool awaited_in_vain = false;
    bool endless = false;
    uint64_t data = 0;
    uint64_t total = 0;  // with the headers
    DumpTime time;
    int waited_ms = 0;      // since the last data
    int interruptions = 0;  // likewise
    for (;;) {
        if (total >= MAX_DUMP || time.too_long(data)) {
            err_log("no end of the AG-DSP dump");
            endless = true;
            break;
        }
        const ssize_t n = read(notifier->fd(), s_io_buffer + DSP_CHUNK_HEADER_LEN, MAX_CHUNK);
        if (n < 0 && errno == EINTR && interruptions < MAX_INTERRUPTIONS) {
            ++interruptions;
            continue;
        }
        if (n < 0 && errno == EAGAIN) {
            if (!stored) {
                // The dump has not begun: the loop tells when there is something to read.
                notifier->note_read(false);
                return;
            }
            if (waited_ms < DUMP_PATIENCE_MS) {
                await_dump(notifier->fd(), waited_ms == 0);
                waited_ms += DUMP_STEP_MS;
                continue;
            }
            awaited_in_vain = true;
        }
        if (n < 0) {
            err_log("read AG-DSP dump device error");
            break;
        }
        if (n == 0) {
            break;
        }
        const size_t len = static_cast<size_t>(n);
        if (write_chunk(len, DLT_DUMP) != static_cast<int>(len + DSP_CHUNK_HEADER_LEN)) {
            err_log("%s save AG-DSP dump error", name().string());
            break;
        }
        stored = true;
        data += len;
        total += len + DSP_CHUNK_HEADER_LEN;
        waited_ms = 0;
        interruptions = 0;
    }
    // One that keeps the loop waiting like that each time rests in between.
    notifier->note_read(stored && !awaited_in_vain);
    complete_dump(notifier->fd());
    flush();
    if (endless) {
        notifier->close();  // or it would go on with the next pass of the loop
    }
}
