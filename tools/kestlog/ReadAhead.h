// SPDX-License-Identifier: Apache-2.0
// Reads a large file in a thread of its own, a few blocks ahead of who works on them.
#ifndef KESTLOG_READAHEAD_H_
#define KESTLOG_READAHEAD_H_

#include <pthread.h>
#include <stddef.h>
#include <stdint.h>

#include <condition_variable>
#include <mutex>
#include <vector>

class ReadAhead {
public:
    // Of a block, and of the room before its bytes, where who takes it may put the bytes that it
    // has left.
    static constexpr size_t SIZE = 256 * 1024;

    struct Block {
        std::vector<uint8_t> bytes;
        size_t len = 0;  // from SIZE on; less than SIZE only in the last block
        int error = 0;   // errno of a failed read behind these bytes
    };

    ReadAhead() = default;
    ~ReadAhead();
    ReadAhead(const ReadAhead&) = delete;
    ReadAhead& operator=(const ReadAhead&) = delete;

    // Begins to read size bytes of fd, which stays open until the end of this object. False when
    // there can be no thread.
    bool start(int fd, uint64_t size);
    // Waits for the next block. It and the one before it stay as they are until the next call.
    // With less than SIZE bytes it is the last one.
    Block* next();

private:
    static constexpr size_t BLOCKS = 4;
    static constexpr size_t IN_USE = 2;  // those that were taken last

    static void* run(void* self);
    void read_blocks();
    void fill(Block* block);

    pthread_t m_thread{};
    bool m_started = false;
    int m_fd = -1;
    uint64_t m_left = 0;
    Block m_blocks[BLOCKS];
    std::mutex m_mutex;
    std::condition_variable m_changed;
    // Numbers of blocks from the start of the file on.
    uint64_t m_filled = 0;
    uint64_t m_taken = 0;
    bool m_stop = false;
};

#endif  // KESTLOG_READAHEAD_H_
