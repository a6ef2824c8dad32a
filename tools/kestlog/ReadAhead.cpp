// SPDX-License-Identifier: Apache-2.0

#include "kestlog/ReadAhead.h"

#include <errno.h>
#include <unistd.h>

#include <algorithm>

ReadAhead::~ReadAhead() {
    if (m_started) {
        {
            const std::lock_guard<std::mutex> lock(m_mutex);
            m_stop = true;
        }
        m_changed.notify_all();
        pthread_join(m_thread, nullptr);
    }
}

bool ReadAhead::start(int fd, uint64_t size) {
    m_fd = fd;
    m_left = size;
    for (Block& block : m_blocks) {
        block.bytes.resize(2 * SIZE);
    }
    m_started = pthread_create(&m_thread, nullptr, run, this) == 0;
    return m_started;
}

void* ReadAhead::run(void* self) {
    static_cast<ReadAhead*>(self)->read_blocks();
    return nullptr;
}

void ReadAhead::read_blocks() {
    for (uint64_t number = 0;; ++number) {
        {
            std::unique_lock<std::mutex> lock(m_mutex);
            m_changed.wait(lock, [&] { return m_stop || number < m_taken + BLOCKS - IN_USE; });
            if (m_stop) {
                return;
            }
        }
        Block& block = m_blocks[number % BLOCKS];
        fill(&block);
        {
            const std::lock_guard<std::mutex> lock(m_mutex);
            m_filled = number + 1;
        }
        m_changed.notify_all();
        if (block.len < SIZE) {
            return;
        }
    }
}

void ReadAhead::fill(Block* block) {
    block->len = 0;
    block->error = 0;
    while (block->len < SIZE && m_left > 0) {
        const size_t want = static_cast<size_t>(std::min<uint64_t>(SIZE - block->len, m_left));
        const ssize_t n = read(m_fd, block->bytes.data() + SIZE + block->len, want);
        if (n < 0 && errno == EINTR) {
            continue;
        }
        if (n <= 0) {  // 0: it has become shorter
            block->error = n < 0 ? errno : 0;
            m_left = 0;
            break;
        }
        block->len += static_cast<size_t>(n);
        m_left -= static_cast<uint64_t>(n);
    }
}

ReadAhead::Block* ReadAhead::next() {
    std::unique_lock<std::mutex> lock(m_mutex);
    m_changed.wait(lock, [&] { return m_filled > m_taken; });
    Block* const block = &m_blocks[m_taken % BLOCKS];
    ++m_taken;
    lock.unlock();
    m_changed.notify_all();
    return block;
}
