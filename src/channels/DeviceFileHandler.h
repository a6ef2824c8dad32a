// SPDX-License-Identifier: Apache-2.0
// Reads a device into a buffer and hands each chunk to its subclass. Made for the
// duration of one exchange with a CP and owned by the channel that runs it. The device
// is opened from a path and closed with the handler, or borrowed from the channel and
// left open.
#ifndef CHANNELS_DEVICEFILEHANDLER_H_
#define CHANNELS_DEVICEFILEHANDLER_H_

#include <stddef.h>
#include <stdint.h>
#include <utils/String8.h>

#include <memory>

#include "core/FdHandler.h"

class DeviceFileHandler : public FdHandler {
public:
    // Reads of one wake-up. The rest of a device that never runs dry comes at the next one,
    // after the other handlers had their turn.
    static constexpr int MAX_READS = 8;

    struct DataBuffer {
        explicit DataBuffer(size_t size)
            : buffer(new uint8_t[size]), capacity(size), data_start(0), data_len(0) {}

        // The unconsumed bytes: data_len of them at data().
        const uint8_t* data() const { return buffer.get() + data_start; }
        void consume_all() { data_start = data_len = 0; }

        const std::unique_ptr<uint8_t[]> buffer;
        size_t capacity;
        size_t data_start;
        size_t data_len;
    };

    // On a device that open() opens.
    DeviceFileHandler(const android::String8& path, size_t capacity, LogController* ctrl,
                      Multiplexer* mux);
    // On a descriptor that belongs to somebody else.
    DeviceFileHandler(int fd, size_t capacity, LogController* ctrl, Multiplexer* mux);
    ~DeviceFileHandler() override;

    // Opens the device; the descriptor or -1.
    int open();

    // Reads until the device has no more data, process_data wants no more now or MAX_READS
    // are made. A device that fails stays polled, in the end at long intervals (note_idle);
    // a failure that exactly repeats the one before is not logged again.
    void process(int events) override;

    // Takes what the buffer holds. True: stop reading now; the handler may be destroyed
    // already. False: read more.
    virtual bool process_data(DataBuffer& buf) = 0;

    const android::String8& path() const { return m_path; }

private:
    enum FailureKind { NONE, UNEXPECTED_EVENT, READ_ERROR, READ_NOTHING };

    // Remembers a failure and its events or errno; false when it repeats the last one.
    bool is_news(FailureKind kind, int detail);
    // The wake-up came to nothing.
    void note_nothing();

    bool m_own_fd;
    FailureKind m_failure = NONE;  // the last one, unless data was read since
    int m_failure_detail = 0;
    android::String8 m_path;
    DataBuffer m_buf;
};

#endif  // CHANNELS_DEVICEFILEHANDLER_H_
