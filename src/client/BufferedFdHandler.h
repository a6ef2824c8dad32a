// SPDX-License-Identifier: Apache-2.0
// A handler that reads a stream of text from a peer into a fixed buffer and leaves the
// meaning of the bytes to its subclass: control clients and CP supervisors. Never reads
// more than the buffer holds. Loop thread only.
#ifndef CLIENT_BUFFEREDFDHANDLER_H_
#define CLIENT_BUFFEREDFDHANDLER_H_

#include <stddef.h>
#include <stdint.h>

#include <memory>

#include "core/FdHandler.h"

class BufferedFdHandler : public FdHandler {
public:
    // Takes over fd (-1: none yet); the buffer has capacity bytes.
    BufferedFdHandler(int fd, LogController* ctrl, Multiplexer* mux, size_t capacity);
    ~BufferedFdHandler() override;

    // Reads once and tells the subclass. The object may be gone when this returns.
    void process(int events) override;

    // Bytes have arrived: consume what is wanted of the buffer, and note_alive if they are of
    // any use. Returns 0. May destroy the object.
    virtual int process_data() = 0;
    // The peer has closed the connection, or has filled the buffer without anything being
    // consumed. May destroy the object.
    virtual void process_conn_closed() = 0;
    // A read failed with errno err. May destroy the object.
    virtual void process_conn_error(int err) = 0;

protected:
    const size_t m_capacity;
    const std::unique_ptr<uint8_t[]> m_buffer;
    size_t m_data_len = 0;  // bytes held, from the buffer's start
};

#endif  // CLIENT_BUFFEREDFDHANDLER_H_
