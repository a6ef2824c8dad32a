// SPDX-License-Identifier: Apache-2.0
// The books of the streams: every byte that the service read from a log device has to reach a
// log file, in order and once. Bytes may be lost only for a reason that was noted here before,
// and not more of them than that reason explains.
#ifndef SIMULATION_LEDGER_H_
#define SIMULATION_LEDGER_H_

#include <stddef.h>
#include <stdint.h>

#include <string>
#include <vector>

struct FdInfo;

namespace ledger {

// What a stream may have outstanding at most, read and not on a medium, while nothing fails: a
// full staging buffer of 64 KiB and a block of 32 KiB, which becomes a little more as a chunk.
constexpr uint64_t STAGED_AND_BLOCK = 65536 + 2 * 32768;

// Something failed that may cost a stream, or each of them, all that is outstanding.
void excuse(unsigned stream);
void excuse_all();
// The service is about to be killed: what was staged is lost.
void excuse_kill();

// The service read so many bytes from the stream's log device. diverted: not into the log.
void consumed(unsigned stream, size_t len, bool diverted);
// So many of the bytes that it read there were an answer's, and become log data.
void answer_logged(unsigned stream, size_t len);
// These bytes reached a log file.
void file_written(FdInfo& file, const uint8_t* data, size_t len);
// A log file is deleted; the rest of what its descriptor gets is deleted too.
void file_removed(const std::string& path, unsigned channel);

// Nothing that was read of the stream is outstanding without a reason.
void check_written(unsigned stream);
// What the devices gave has been read.
void check_read();
// Nothing may be outstanding when everything was calm and written out.
void check_settled();

// The streams whose bytes the log files of a channel hold.
std::vector<unsigned> streams_in(unsigned channel);
// The bytes of the stream in a log file on a medium. The whole file is checked: its bytes are
// the stream's, in order.
uint64_t stream_bytes(const std::string& path, unsigned stream);

}  // namespace ledger

#endif  // SIMULATION_LEDGER_H_
