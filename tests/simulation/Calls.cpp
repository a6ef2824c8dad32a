// SPDX-License-Identifier: Apache-2.0

#include "simulation/Calls.h"

#include <dirent.h>
#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <stdarg.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <map>
#include <vector>

#include "core/SavedErrno.h"
#include "sim/calls.h"
#include "sim/to_timespec.h"
#include "simulation/Ledger.h"
#include "simulation/SavingThread.h"
#include "simulation/World.h"

FdInfo g_fds[MAX_FDS];
State* g_state;
__thread bool g_inside;
bool g_plan_over;

// With the symbols that the C library has for them.
#define DECLARE(NAME, name, kind, result, params, args)                    \
    extern "C" result __real_##name params __asm__("__real_" kind(#name)); \
    extern "C" result __wrap_##name params __asm__("__wrap_" kind(#name));
KEST_CALLS(DECLARE, DECLARE)

namespace {

int s_trace_fd = -1;
std::map<DIR*, std::pair<std::vector<struct dirent>, size_t>> s_dirs;

constexpr uint64_t MAX_CALLS_A_PASS = 200000;
constexpr int SHORT_COUNT = -1;  // a call shall do less than it was asked for

std::string without_root(const char* text) {
    std::string cut(text);
    const std::string& root = world().root();
    for (size_t at; (at = cut.find(root)) != std::string::npos;) {
        cut.replace(at, root.size(), "");
    }
    return cut;
}

[[noreturn]] void die() {
    const Outside outside;
    ++g_state->counters.kills;
    g_state->kill_at = 0;
    g_state->killed = true;
    trace("killed");
    world().service_dies();
    ledger::excuse_kill();
    end_life(LIFE_KILLED);
}

// What every call of the service begins with: 0, the errno to fail with, or SHORT_COUNT.
int begin(Call call, Place place) {
    State& state = *g_state;
    if (SavingThread::here()) {
        ++state.counters.thread_steps;
        world().thread().stop_before_call();
    } else {
        world().thread().lead(false);
    }
    ++state.counters.calls;
    state.boot_ns += 1000;
    if (state.kill_at && state.counters.calls >= state.kill_at) {
        die();
    }
    if (state.counters.calls - state.pass_calls > MAX_CALLS_A_PASS) {
        fail_run("hang", "%llu calls in one pass of the loop, now %u in place %u",
                 number(MAX_CALLS_A_PASS), call, place);
    }
    for (FaultRule& rule : state.faults) {
        // What fails in the start for want of these stays so for the life of the process.
        if (state.starting &&
            (place == PLACE_PROPS || place == PLACE_SOCKET ||
             (place == PLACE_SETTINGS && (call == CALL_FCNTL || call == CALL_STAT)))) {
            continue;
        }
        if (!rule.active || rule.call != call || (rule.place != PLACE_ANY && rule.place != place)) {
            continue;
        }
        if (rule.skip > 0) {
            --rule.skip;
            continue;
        }
        if (rule.times != UINT32_MAX && --rule.times == 0) {
            rule.active = false;
        }
        ++state.counters.faults;
        state.fault_in_step = true;
        state.fault_seen = true;
        state.faulted = true;
        state.card_fresh = false;
        const Outside outside;
        world().rule_fired(call, place);
        ledger::excuse_all();
        trace("fault %llu %d", number(call + PLAN_PLACE * place), rule.error);
        return rule.error ? rule.error : SHORT_COUNT;
    }
    return 0;
}

int failed(int error) {
    errno = error;
    return -1;
}

Place place_of_fd(int fd) {
    return fd >= 0 && fd < MAX_FDS ? g_fds[fd].place : PLACE_OTHER;
}

bool on_medium(Place place) {
    return place == PLACE_DATA || place == PLACE_CARD;
}

// Why nothing can be changed in that place now: 0 when it can.
int refusal(Place place, bool takes_room) {
    State& state = *g_state;
    int error = 0;
    if (place == PLACE_CARD && !state.card_in) {
        error = EACCES;
    } else if (place == PLACE_CARD && state.card_read_only) {
        error = EROFS;
    } else if (takes_room && on_medium(place) &&
               state.room[place == PLACE_CARD ? MED_CARD : MED_DATA] == 0) {
        error = ENOSPC;
        state.full_seen = true;
    }
    if (error) {
        state.fault_in_step = true;
        state.card_failed_ns = place == PLACE_CARD ? state.boot_ns : state.card_failed_ns;
        ledger::excuse_all();
    }
    return error;
}

// The same, after a rule had its chance.
int hindrance(Call call, Place place, bool takes_room) {
    const int fault = begin(call, place);
    return fault > 0 ? fault : refusal(place, takes_room);
}

bool exists(const char* path) {
    const Outside outside;
    struct stat st;
    return lstat(path, &st) == 0;
}

int result_of(const char* name, const char* path, int result) {
    trace("%s %s = %d%s%s", name, path, result < 0 ? -1 : 0, result < 0 ? " " : "",
          result < 0 ? strerror(errno) : "");
    return result;
}

void forget_fd(int fd) {
    if (fd >= 0 && fd < MAX_FDS) {
        g_fds[fd] = FdInfo();
    }
}

// How many of the bytes a medium takes now; -1 with errno when it takes none.
ssize_t taken_by_medium(const FdInfo& info, size_t len, int fault) {
    State& state = *g_state;
    if (info.place == PLACE_CARD && (!state.card_in || info.generation != state.card_generation)) {
        state.fault_in_step = true;
        state.card_failed_ns = state.boot_ns;
        ledger::excuse_all();
        return failed(EIO);
    }
    if (fault == SHORT_COUNT && len > 1) {
        len = 1 + static_cast<size_t>(state.counters.calls % (len - 1));
    }
    if (!info.removed) {
        if (const int error = refusal(info.place, true)) {
            return failed(error);
        }
        uint64_t& room = state.room[info.place == PLACE_CARD ? MED_CARD : MED_DATA];
        if (room != UINT64_MAX) {
            if (room < len) {
                state.fault_in_step = true;
                ledger::excuse_all();
                len = static_cast<size_t>(room);
            }
            room -= len;
        }
    }
    return static_cast<ssize_t>(len);
}

// A write of the service into a log tree, as far as the medium takes it.
ssize_t write_to_medium(int fd, const struct iovec* pieces, int count, int fault) {
    FdInfo& info = g_fds[fd];
    const Outside outside;
    std::vector<uint8_t> data;
    for (int i = 0; i < count; ++i) {
        const uint8_t* const piece = static_cast<const uint8_t*>(pieces[i].iov_base);
        data.insert(data.end(), piece, piece + pieces[i].iov_len);
    }
    ssize_t n = taken_by_medium(info, data.size(), fault);
    if (n > 0) {
        n = write(fd, data.data(), static_cast<size_t>(n));
    }
    if (n > 0 && info.cls == FD_LOG_FILE) {
        ledger::file_written(info, data.data(), static_cast<size_t>(n));
    }
    if (info.cls == FD_IQ_FILE) {
        IqDevice::written(data.data(), n);
        info.position += n > 0 ? static_cast<uint64_t>(n) : 0;
    }
    trace("write %s %zd", info.cls == FD_LOG_FILE ? "log" : "file", n);
    return n;
}

// A command to the saving thread, or its response.
ssize_t write_to_thread(int fd, uint8_t byte) {
    const ssize_t n = __real_write(fd, &byte, 1);
    if (SavingThread::here()) {
        IqDevice::responds(byte);
    } else {
        IqDevice::commanded(byte);
        world().thread().wake();
    }
    return n;
}

}  // namespace

FdInfo& remember_fd(int fd, FdClass cls, Place place) {
    if (fd >= MAX_FDS) {
        fail_run("leak", "descriptor %d", fd);
    }
    g_fds[fd] = FdInfo();
    g_fds[fd].cls = cls;
    g_fds[fd].place = place;
    return g_fds[fd];
}

void print_traces_to(int fd) {
    s_trace_fd = fd;
}

void trace(const char* format, ...) {
    const Outside outside;
    const SavedErrno keep;
    char text[1200];
    va_list args;
    va_start(args, format);
    vsnprintf(text, sizeof(text), format, args);
    va_end(args);
    const std::string line = without_root(text) + "\n";
    for (char c : line) {
        g_state->digest = (g_state->digest ^ static_cast<uint8_t>(c)) * 0x100000001b3u;
    }
    if (s_trace_fd >= 0) {
        dprintf(s_trace_fd, "%10.3f %s", static_cast<double>(g_state->boot_ns) / 1e9, line.c_str());
    }
}

#if defined(KEST_COVERAGE)
extern "C" void __gcov_dump();
#endif

void end_life(LifeEnd end) {
    const Outside outside;
#if defined(KEST_COVERAGE)
    __gcov_dump();  // what this process counted
#endif
    _exit(end);
}

void fail_run(const char* failure_class, const char* format, ...) {
    const Outside outside;
    snprintf(g_state->failure_class, sizeof(g_state->failure_class), "%s", failure_class);
    va_list args;
    va_start(args, format);
    char text[1500];
    vsnprintf(text, sizeof(text), format, args);
    va_end(args);
    snprintf(g_state->failure, sizeof(g_state->failure), "%s", without_root(text).c_str());
    trace("FAILED %s: %s", failure_class, g_state->failure);
    if (getenv("SIMULATION_ABORT")) {
        abort();  // a stack trace is wanted
    }
    end_life(LIFE_FAILED);
}

#define WRAPPED(result, name, ...)                \
    extern "C" result __real_##name(__VA_ARGS__); \
    extern "C" result __wrap_##name(__VA_ARGS__); \
    extern "C" result __wrap_##name(__VA_ARGS__)

// The same, for a call of the service alone.
#define INSIDE(result, name, arguments, ...)                                 \
    static result inside_##name(__VA_ARGS__);                                \
    WRAPPED(result, name, __VA_ARGS__) {                                     \
        return g_inside ? inside_##name arguments : __real_##name arguments; \
    }                                                                        \
    static result inside_##name(__VA_ARGS__)

// The same, for one that may fail by a rule. Its body knows of a SHORT_COUNT by fault.
#define FALLIBLE(result, name, call, place, arguments, ...)                      \
    static result allowed_##name(int fault, __VA_ARGS__);                        \
    INSIDE(result, name, arguments, __VA_ARGS__) {                               \
        const int fault = begin(call, place);                                    \
        errno = fault > 0 ? fault : errno;                                       \
        return fault > 0 ? faults::failure<result>()                             \
                         : allowed_##name(fault, WITHOUT_PARENTHESES arguments); \
    }                                                                            \
    static result allowed_##name([[maybe_unused]] int fault, __VA_ARGS__)
#define WITHOUT_PARENTHESES(...) __VA_ARGS__

// And one that else does what it always does.
#define WITH_FAULTS(name, call, place, arguments, ...)         \
    FALLIBLE(int, name, call, place, arguments, __VA_ARGS__) { \
        return __real_##name arguments;                        \
    }

// ---- Time

INSIDE(int, clock_gettime, (clock, now), clockid_t clock, struct timespec* now) {
    const int64_t ns = g_state->boot_ns + (clock == CLOCK_REALTIME ? g_state->wall_ns : 0);
    *now = to_timespec(ns);
    return 0;
}

INSIDE(time_t, time, (result), time_t* result) {
    const time_t now = to_timespec(g_state->boot_ns + g_state->wall_ns).tv_sec;
    if (result) {
        *result = now;
    }
    return now;
}

INSIDE(int, usleep, (us), useconds_t us) {
    begin(CALL_COUNT, PLACE_OTHER);
    if (SavingThread::here()) {
        world().thread().stop_before_call(int64_t{us} * 1000);
        return 0;
    }
    g_state->boot_ns += int64_t{us} * 1000;
    const Outside outside;
    world().pump();
    return 0;
}

INSIDE(pid_t, getpid, (), ) {
    return 77;
}

// ---- The loop

INSIDE(int, poll, (fds, count, timeout), struct pollfd* fds, nfds_t count, int timeout) {
    const bool loops_own = world().is_loops_own(fds);
    if (const int error = begin(CALL_POLL, PLACE_ANY)) {
        if (loops_own) {
            world().pass_ends(false);
        }
        return failed(error == SHORT_COUNT ? EINTR : error);
    }
    if (SavingThread::here()) {
        int ready;
        while ((ready = __real_poll(fds, count, 0)) == 0) {
            world().thread().rest();
        }
        return ready;
    }
    const Outside outside;
    return world().wait(fds, count, timeout, loops_own);
}

// ---- Descriptors

INSIDE(int, open, (path, flags, mode), const char* path, int flags, mode_t mode) {
    const Place place = world().place_of(path);
    if (const int error = begin(CALL_OPEN, place)) {
        return result_of("open", path, failed(error == SHORT_COUNT ? EMFILE : error));
    }
    const Outside outside;
    if (place == PLACE_DEVICE) {
        return result_of("open", path, world().open_device(path));
    }
    struct stat st;
    const bool there = lstat(path, &st) == 0;
    if (there && S_ISFIFO(st.st_mode) && !(flags & O_NONBLOCK)) {
        fail_run("hang", "blocking open of the FIFO %s", path);
    }
    if ((flags & O_ACCMODE) != O_RDONLY && on_medium(place)) {
        if (const int error = refusal(place, (flags & O_CREAT) && !there)) {
            return result_of("open", path, failed(error));
        }
    }
    const int fd = __real_open(path, flags, mode);
    if (fd >= 0) {
        world().file_opened(path, place, remember_fd(fd, FD_OTHER, place), fd);
    }
    return result_of("open", path, fd);
}

INSIDE(int, close, (fd), int fd) {
    const int error = begin(CALL_CLOSE, place_of_fd(fd));
    forget_fd(fd);
    const int result = __real_close(fd);
    return error > 0 ? failed(error) : result;
}

FALLIBLE(ssize_t, read, CALL_READ, place_of_fd(fd), (fd, data, len), int fd, void* data,
         size_t len) {
    FdInfo& info = g_fds[fd];
    if (info.failed) {
        world().reading_failed();
        return failed(EIO);
    }
    if (fault == SHORT_COUNT && len > 1) {
        len = 1 + static_cast<size_t>(g_state->counters.calls % std::min<size_t>(len - 1, 100));
    }
    ssize_t n = __real_read(fd, data, len);
    const int error = errno;
    if (n < 0 && info.cls == FD_LOG_DEVICE && info.stream == ST_DUMP && Devices::dump_ends()) {
        n = 0;
    }
    if (n > 0) {
        const Outside outside;
        world().service_read(info, static_cast<size_t>(n));
    }
    errno = error;
    return n;
}

INSIDE(ssize_t, write, (fd, data, len), int fd, const void* data, size_t len) {
    if (fd == STDERR_FILENO) {
        const Outside outside;
        const std::string text(static_cast<const char*>(data), len);
        world().message(without_root(text.c_str()));
        return static_cast<ssize_t>(len);
    }
    if (g_fds[fd].cls == FD_CLIENT) {
        const Outside outside;
        world().service_answers({static_cast<const char*>(data), len});
    }
    const int fault = begin(CALL_WRITE, place_of_fd(fd));
    if (fault > 0) {
        if (g_fds[fd].cls == FD_IQ_FILE) {
            IqDevice::written(nullptr, -1);
        }
        return failed(fault);
    }
    if (g_fds[fd].cls == FD_THREAD) {
        return write_to_thread(fd, *static_cast<const uint8_t*>(data));
    }
    if (SavingThread::here() && g_fds[fd].cls != FD_IQ_FILE) {
        fail_run("thread", "it writes to a descriptor of class %d", g_fds[fd].cls);
    }
    if (on_medium(g_fds[fd].place)) {
        const struct iovec piece = {const_cast<void*>(data), len};
        return write_to_medium(fd, &piece, 1, fault);
    }
    if (g_fds[fd].failed) {
        return failed(EIO);
    }
    // A short line on a local socket is taken whole.
    const bool cut = fault == SHORT_COUNT && len > 1 && g_fds[fd].place != PLACE_SOCKET;
    return __real_write(fd, data, cut ? len / 2 : len);
}

FALLIBLE(ssize_t, writev, CALL_WRITE, place_of_fd(fd), (fd, pieces, count), int fd,
         const struct iovec* pieces, int count) {
    return write_to_medium(fd, pieces, count, fault);
}

FALLIBLE(ssize_t, pwrite, CALL_WRITE, place_of_fd(fd), (fd, data, len, offset), int fd,
         const void* data, size_t len, off_t offset) {
    return __real_pwrite(fd, data, fault == SHORT_COUNT && len > 1 ? len / 2 : len, offset);
}

WITH_FAULTS(ftruncate, CALL_TRUNCATE, place_of_fd(fd), (fd, len), int fd, off_t len)
WITH_FAULTS(fcntl, CALL_FCNTL, place_of_fd(fd), (fd, command, argument), int fd, int command,
            unsigned long argument)

INSIDE(int, fclose, (file), FILE* file) {
    const int fault = begin(CALL_CLOSE, place_of_fd(fileno(file)));
    forget_fd(fileno(file));
    const int result = __real_fclose(file);
    return fault > 0 ? failed(fault) : result;
}

INSIDE(int, ioctl, (fd, request, argument), int fd, unsigned long request, unsigned long argument) {
    const int fault = begin(CALL_IOCTL, place_of_fd(fd));
    if (fault > 0 && g_fds[fd].cls == FD_IQ_DEVICE) {
        g_state->iq.taken = false;  // the driver goes on to report a buffer it could not release
    }
    if (g_fds[fd].cls == FD_LOG_DEVICE) {
        const Outside outside;
        world().dump_confirmed(fd);
    }
    if (fault > 0 || g_fds[fd].cls != FD_IQ_DEVICE) {
        return fault > 0 ? failed(fault) : 0;
    }
    const Outside outside;
    return world().iq().control(request, argument);
}

INSIDE(void*, mmap, (address, len, protection, flags, fd, offset), void* address, size_t len,
       int protection, int flags, int fd, off_t offset) {
    if (fd < 0 || g_fds[fd].cls != FD_IQ_DEVICE) {
        return __real_mmap(address, len, protection, flags, fd, offset);
    }
    if (const int fault = begin(CALL_MMAP, PLACE_DEVICE)) {
        failed(fault == SHORT_COUNT ? ENOMEM : fault);
        return MAP_FAILED;
    }
    const Outside outside;
    return IqDevice::map(len, protection, flags);
}

// ---- The saving thread

INSIDE(int, pthread_create, (id, attributes, routine, param), pthread_t* id,
       const pthread_attr_t* attributes, void* (*routine)(void*), void* param) {
    (void)attributes;
    const int fault = begin(CALL_THREAD, PLACE_OTHER);
    return fault ? EAGAIN : world().thread().create(id, routine, param);
}

INSIDE(int, pthread_join, (id, result), pthread_t id, void** result) {
    (void)result;
    begin(CALL_COUNT, PLACE_OTHER);
    return world().thread().join(id);
}

FALLIBLE(int, socketpair, CALL_SOCKET, PLACE_OTHER, (domain, type, protocol, pair), int domain,
         int type, int protocol, int* pair) {
    const int result = __real_socketpair(domain, type, protocol, pair);
    if (result == 0) {
        remember_fd(pair[0], FD_THREAD, PLACE_OTHER);
        remember_fd(pair[1], FD_THREAD, PLACE_OTHER);
    }
    return result;
}

INSIDE(int, shutdown, (fd, how), int fd, int how) {
    begin(CALL_COUNT, PLACE_OTHER);
    const int result = __real_shutdown(fd, how);
    if (!SavingThread::here()) {
        world().thread().wake();
    }
    return result;
}

// ---- Names

FALLIBLE(int, stat, CALL_STAT, world().place_of(path), (path, st), const char* path,
         struct stat* st) {
    const int result = __real_stat(path, st);
    if (result == 0) {
        world().set_times(path, *st);
    }
    return result;
}

WITH_FAULTS(lstat, CALL_STAT, world().place_of(path), (path, st), const char* path, struct stat* st)
WITH_FAULTS(fstatat, CALL_STAT, place_of_fd(fd), (fd, name, st, flags), int fd, const char* name,
            struct stat* st, int flags)

FALLIBLE(int, fstat, CALL_STAT, place_of_fd(fd), (fd, st), int fd, struct stat* st) {
    const int result = __real_fstat(fd, st);
    if (result == 0 && g_fds[fd].place == PLACE_PROPS) {
        world().set_times("", *st);
    }
    return result;
}

INSIDE(int, access, (path, mode), const char* path, int mode) {
    const Place place = world().place_of(path);
    if (const int fault = begin(CALL_ACCESS, place)) {
        return failed(fault == SHORT_COUNT ? EIO : fault);
    }
    if (place == PLACE_CARD && g_state->card_read_only && (mode & W_OK)) {
        g_state->fault_in_step = true;
        ledger::excuse_all();
        return failed(EROFS);
    }
    return __real_access(path, mode);
}

INSIDE(int, rename, (from, to), const char* from, const char* to) {
    if (const int error = hindrance(CALL_RENAME, world().place_of(from), false)) {
        return result_of("rename", from, failed(error));
    }
    if (exists(to)) {
        fail_run("replaced", "rename of %s replaces %s", from, to);
    }
    return result_of("rename", to, __real_rename(from, to));
}

INSIDE(int, unlink, (path), const char* path) {
    const Place place = world().place_of(path);
    if (const int error = hindrance(CALL_UNLINK, place, false)) {
        return result_of("unlink", path, failed(error));
    }
    {
        const Outside outside;
        world().service_deletes(path, place);
    }
    return result_of("unlink", path, __real_unlink(path));
}

INSIDE(int, mkdir, (path, mode), const char* path, mode_t mode) {
    if (exists(path)) {
        return __real_mkdir(path, mode);
    }
    world().set_begins(path);
    const int error = hindrance(CALL_MKDIR, world().place_of(path), true);
    return result_of("mkdir", path, error ? failed(error) : __real_mkdir(path, mode));
}

INSIDE(int, rmdir, (path), const char* path) {
    const int error = hindrance(CALL_RMDIR, world().place_of(path), false);
    return result_of("rmdir", path, error ? failed(error) : __real_rmdir(path));
}

INSIDE(int, system, (command), const char* command) {
    const int fault = begin(CALL_SYSTEM, PLACE_ANY);
    const Outside outside;
    trace("system %s", without_root(command).c_str());
    return fault > 0 ? failed(fault) : world().remove_by_shell(command);
}

FALLIBLE(DIR*, opendir, CALL_OPENDIR, world().place_of(path), (path), const char* path) {
    const Outside outside;
    DIR* const dir = opendir(path);
    if (dir) {
        remember_fd(dirfd(dir), FD_DIR, world().place_of(path));
        auto& entries = s_dirs[dir].first;
        while (const struct dirent* entry = readdir(dir)) {
            entries.push_back(*entry);
        }
        std::sort(entries.begin(), entries.end(),
                  [](const auto& a, const auto& b) { return strcmp(a.d_name, b.d_name) < 0; });
    }
    return dir;
}

INSIDE(struct dirent*, readdir, (dir), DIR* dir) {
    if (const int fault = begin(CALL_READDIR, place_of_fd(dirfd(dir)))) {
        errno = fault == SHORT_COUNT ? 0 : fault;
        return nullptr;
    }
    auto& listing = s_dirs[dir];
    return listing.second < listing.first.size() ? &listing.first[listing.second++] : nullptr;
}

INSIDE(int, closedir, (dir), DIR* dir) {
    begin(CALL_CLOSE, place_of_fd(dirfd(dir)));
    forget_fd(dirfd(dir));
    s_dirs.erase(dir);
    return __real_closedir(dir);
}

// ---- Sockets

FALLIBLE(int, socket, CALL_SOCKET, PLACE_SOCKET, (domain, type, protocol), int domain, int type,
         int protocol) {
    const int fd = __real_socket(domain, type, protocol);
    if (fd >= 0) {
        remember_fd(fd, FD_CONNECTION, PLACE_SOCKET);
    }
    return fd;
}

INSIDE(int, listen, (fd, backlog), int fd, int backlog) {
    g_fds[fd].cls = FD_SERVER;
    return __real_listen(fd, backlog);
}

FALLIBLE(int, connect, CALL_CONNECT, PLACE_SOCKET, (fd, address, len), int fd,
         const struct sockaddr* address, socklen_t len) {
    if (!(__real_fcntl(fd, F_GETFL, 0) & O_NONBLOCK)) {
        fail_run("hang", "blocking connect");
    }
    return __real_connect(fd, address, len);
}

FALLIBLE(int, accept4, CALL_ACCEPT, PLACE_SOCKET, (fd, address, len, flags), int fd,
         struct sockaddr* address, socklen_t* len, int flags) {
    const int client = __real_accept4(fd, address, len, flags);
    if (client >= 0) {
        remember_fd(client, FD_CLIENT, PLACE_SOCKET);
        world().progress();
    }
    return client;
}

bool has_hung_up(int fd) {
    struct pollfd other = {fd, 0, 0};
    return __real_poll(&other, 1, 0) == 1;
}
