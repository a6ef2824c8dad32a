// SPDX-License-Identifier: Apache-2.0
// The service's calls of the C library, on their way through the simulation. The program is
// linked with --wrap for each of them. A call that the service makes counts as a step, moves
// the virtual time on a little, may be the one at which the process dies, and fails when a
// rule says so. Calls of the simulation itself pass untouched.
#ifndef SIMULATION_CALLS_H_
#define SIMULATION_CALLS_H_

#include <stddef.h>
#include <stdint.h>
#include <sys/types.h>

#include "simulation/State.h"

enum Call : uint8_t {
    CALL_OPEN,
    CALL_READ,
    CALL_WRITE,
    CALL_CLOSE,
    CALL_STAT,
    CALL_ACCESS,
    CALL_RENAME,
    CALL_UNLINK,
    CALL_MKDIR,
    CALL_RMDIR,
    CALL_OPENDIR,
    CALL_READDIR,
    CALL_TRUNCATE,
    CALL_SYSTEM,
    CALL_SOCKET,
    CALL_CONNECT,
    CALL_ACCEPT,
    CALL_FCNTL,
    CALL_POLL,
    CALL_MMAP,
    CALL_IOCTL,
    CALL_THREAD,
    CALL_COUNT
};

enum Place : uint8_t {
    PLACE_ANY,
    PLACE_DATA,  // log tree of the internal medium
    PLACE_CARD,
    PLACE_SETTINGS,
    PLACE_PROPS,
    PLACE_DEVICE,
    PLACE_SOCKET,
    PLACE_OTHER,
    PLACE_COUNT
};

enum FdClass : uint8_t {
    FD_NONE,
    FD_LOG_DEVICE,
    FD_DIAG_DEVICE,
    FD_LOG_FILE,
    FD_TREE_FILE,  // any other file in a log tree
    FD_DIR,
    FD_SERVER,
    FD_CLIENT,
    FD_CONNECTION,  // to a supervisor or the time service
    FD_OTHER,
    FD_IQ_DEVICE,
    FD_IQ_FILE,
    FD_THREAD,  // an end of the connection to the saving thread
    FD_CLASS_COUNT
};

// What the simulation knows of a descriptor that the service has open.
struct FdInfo {
    FdClass cls = FD_NONE;
    Place place = PLACE_OTHER;
    unsigned stream = 0;
    uint32_t generation = 0;  // of the card
    bool removed = false;     // the file has no name any more
    bool opened_in_calm = false;
    bool failed = false;  // the device gives errors from now on
    ino_t inode = 0;
    // Of a log file: how far its head or its present chunk has come.
    uint64_t position = 0;
    bool has_record = false;
    uint8_t header[20] = {};
    size_t header_len = 0;
    size_t payload_left = 0;
};

constexpr int MAX_FDS = 1024;
extern FdInfo g_fds[MAX_FDS];
bool has_hung_up(int fd);  // who is at the other end
FdInfo& remember_fd(int fd, FdClass cls, Place place);
extern State* g_state;
extern __thread bool g_inside;  // the service is running, not the simulation
extern bool g_plan_over;        // the loop shall not be run once more

// While it exists, calls are the simulation's own.
class Outside {
public:
    Outside() : m_before(g_inside) { g_inside = false; }
    ~Outside() { g_inside = m_before; }
    Outside(const Outside&) = delete;
    Outside& operator=(const Outside&) = delete;

private:
    const bool m_before;
};

// Adds a line to the trace, which the digest of the run covers; the root is cut out.
void trace(const char* format, ...) __attribute__((format(printf, 1, 2)));
void print_traces_to(int fd);

// Ends the run with a finding.
[[noreturn]] void fail_run(const char* failure_class, const char* format, ...)
    __attribute__((format(printf, 2, 3)));

// Exit statuses of a life of the service.
enum LifeEnd { LIFE_OVER = 0, LIFE_FAILED = 3, LIFE_KILLED = 9 };
// Ends this process without any destructor.
[[noreturn]] void end_life(LifeEnd end);

#endif  // SIMULATION_CALLS_H_
