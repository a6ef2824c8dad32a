// SPDX-License-Identifier: Apache-2.0
// The way into a program that reads a FIFO, and the wait until it has done with the data.
#ifndef BENCH_FEEDING_H_
#define BENCH_FEEDING_H_

#include <stddef.h>
#include <stdint.h>

#include <functional>
#include <string>
#include <vector>

#include "sim/ChildProcess.h"

// The writing end of the FIFO, once the reader has opened its end; or -1. It blocks.
int open_writer(const std::string& fifo, ChildProcess& reader);
// Log text in lines of 100 bytes, which suits the programs that look for lines.
std::vector<uint8_t> log_text(size_t len);
bool write_all(int fd, const uint8_t* data, size_t len);
// Feeds size bytes of log text in writes of so many bytes. After every MiB, each_mib(MiB fed so
// far) is called.
bool feed(int fd, uint64_t size, size_t block, const std::function<void(uint64_t)>& each_mib);
// Waits until the reader has emptied the FIFO.
bool wait_empty(int fd, ChildProcess& reader);
// Waits until the program has not been on a CPU for so long.
void wait_idle(const ChildProcess& program, int ms);

#endif  // BENCH_FEEDING_H_
