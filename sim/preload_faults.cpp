// SPDX-License-Identifier: Apache-2.0
// Preloaded into the service: the calls that its own code makes come here first, and those of
// a plan fail. Calls of libraries go on to the C library, and so do those that have to do with
// the system properties, which are no file on a handset, or with standard error. The clock of
// the timers runs faster, so that time-outs of seconds pass soon.
#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <link.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <bitset>

#include "sim/FaultPlan.h"
#include "sim/to_timespec.h"

using faults::Call;

namespace {

FaultPlan* s_plan;
uintptr_t s_code_begin, s_code_end;  // the program's own
std::bitset<4096> s_property_files;  // descriptors; the loop's thread only
thread_local int s_idle_passes;
timespec s_start;

int find_code(dl_phdr_info* info, size_t /*size*/, void* /*data*/) {
    for (int i = 0; i < info->dlpi_phnum; ++i) {
        const auto& part = info->dlpi_phdr[i];
        if (part.p_type == PT_LOAD && (part.p_flags & PF_X) != 0) {
            s_code_begin = info->dlpi_addr + part.p_vaddr;
            s_code_end = s_code_begin + part.p_memsz;
        }
    }
    return 1;  // the first one is the program
}

__attribute__((constructor)) void find_plan() {
    const char* path = getenv(FAULT_PLAN_VARIABLE);
    const int fd = path ? open(path, O_RDWR | O_CLOEXEC) : -1;
    if (fd < 0) {
        return;
    }
    void* data = mmap(nullptr, sizeof(FaultPlan), PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
    close(fd);
    dl_iterate_phdr(find_code, nullptr);
    clock_gettime(CLOCK_BOOTTIME, &s_start);
    int nobody = 0;  // the shells that the service starts are not meant
    auto* plan = static_cast<FaultPlan*>(data);
    if (data != MAP_FAILED && plan->process.compare_exchange_strong(nobody, getpid())) {
        s_plan = plan;
    }
}

bool from_service(const void* caller) {
    const auto at = reinterpret_cast<uintptr_t>(caller);
    return s_plan && at >= s_code_begin && at < s_code_end;
}

bool is_property_path(const char* path) {
    static const char NAME[] = "/default.prop";
    const size_t len = strlen(path);
    return len >= sizeof NAME - 1 && strcmp(path + len - (sizeof NAME - 1), NAME) == 0;
}

std::bitset<4096>::reference property_file(int fd) {
    return s_property_files[static_cast<size_t>(fd) % s_property_files.size()];
}

template <int call, typename First>
bool counts(First first) {
    if constexpr (call == faults::SOCKET || call == faults::SOCKETPAIR) {
        return true;
    } else if constexpr (std::is_same_v<First, int>) {
        return first > STDERR_FILENO && !property_file(first);
    } else if constexpr (std::is_same_v<First, const char*>) {
        return !is_property_path(first);
    }
    return true;
}

// Counts the call; what is to become of it: 0 nothing, or an errno, or CUT_SHORT.
template <int call, typename First, typename... Rest>
int fault_of(First first, Rest... /*rest*/) {
    if (s_plan->call != call || !counts<call>(first)) {
        return 0;
    }
    const int number = ++s_plan->calls;
    if (number < s_plan->first || number > s_plan->last) {
        return 0;
    }
    ++s_plan->failed;
    return s_plan->error;
}

void note_pass() {
    s_plan->idle_passes = std::max(s_plan->idle_passes.load(), ++s_idle_passes);
}

// What got something done begins the count of idle passes again.
template <int call, typename Result, typename First, typename... Rest>
void note_result(Result result, First first, Rest... /*rest*/) {
    constexpr bool transfers = call == faults::READ || call == faults::WRITE ||
                               call == faults::WRITEV || call == faults::PWRITE;
    if constexpr (transfers) {
        s_idle_passes = result > 0 ? 0 : s_idle_passes;
    } else if constexpr (call == faults::ACCEPT4) {
        s_idle_passes = result >= 0 ? 0 : s_idle_passes;
    } else if constexpr (call == faults::OPEN) {
        if (result >= 0) {
            property_file(result) = is_property_path(first);
        }
    } else if constexpr (call == faults::CLOSE) {
        property_file(first) = false;
    }
}

timespec faster(int64_t ns) {
    return to_timespec(ns / FAULT_CLOCK_SPEED);
}

// How each call is made; most of them plainly.
template <int call>
struct Make {
    template <typename Function, typename... Args>
    static auto it(int /*fault*/, Function* real, Args... args) {
        return real(args...);
    }
};

template <>
struct Make<faults::READ> {
    template <typename Function>
    static ssize_t it(int fault, Function* real, int fd, void* data, size_t len) {
        return real(fd, data, fault ? (len + 1) / 2 : len);
    }
};

template <>
struct Make<faults::WRITE> {
    template <typename Function>
    static ssize_t it(int fault, Function* real, int fd, const void* data, size_t len) {
        return real(fd, data, fault ? (len + 1) / 2 : len);
    }
};

template <>
struct Make<faults::WRITEV> {
    template <typename Function>
    static ssize_t it(int fault, Function* real, int fd, const iovec* pieces, int num) {
        return fault ? write(fd, pieces[0].iov_base, (pieces[0].iov_len + 1) / 2)
                     : real(fd, pieces, num);
    }
};

template <>
struct Make<faults::POLL> {
    template <typename Function>
    static int it(int /*fault*/, Function* real, pollfd* fds, nfds_t num, int timeout) {
        const int ready = real(fds, num, 0);
        if (ready != 0 || timeout == 0) {
            note_pass();
            return ready;
        }
        s_idle_passes = 0;
        const timespec wait = faster(int64_t{timeout} * 1000000);
        return timeout < 0 ? real(fds, num, timeout) : ppoll(fds, num, &wait, nullptr);
    }
};

template <>
struct Make<faults::USLEEP> {
    template <typename Function>
    static int it(int /*fault*/, Function* real, useconds_t us) {
        s_idle_passes = 0;
        return real((us + FAULT_CLOCK_SPEED - 1) / FAULT_CLOCK_SPEED);
    }
};

template <>
struct Make<faults::CLOCK_GETTIME> {
    template <typename Function>
    static int it(int /*fault*/, Function* real, clockid_t id, timespec* now) {
        const int result = real(id, now);
        if (result == 0 && id == CLOCK_BOOTTIME) {
            const int64_t ns = (now->tv_sec - s_start.tv_sec) * int64_t{1000000000} + now->tv_nsec -
                               s_start.tv_nsec;
            *now = to_timespec(s_start.tv_sec * int64_t{1000000000} + s_start.tv_nsec +
                               ns * FAULT_CLOCK_SPEED);
        }
        return result;
    }
};

template <int call, typename Result, typename Function, typename... Args>
Result pass_on(const void* caller, Function* real, Args... args) {
    if (!from_service(caller)) {
        return real(args...);
    }
    const int fault = fault_of<call>(args...);
    if (fault > 0) {
        if constexpr (call == faults::CLOSE) {
            real(args...);  // a close that fails has closed all the same
            note_result<call>(0, args...);
        } else if constexpr (call == faults::POLL) {
            note_pass();
        } else if constexpr (call == faults::PTHREAD_CREATE) {
            return fault;
        }
        errno = fault;
        return faults::failure<Result>();
    }
    const Result result = Make<call>::it(fault, real, args...);
    note_result<call>(result, args...);
    return result;
}

template <typename Function>
Function* next_symbol(const char* name) {
    return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

}  // namespace

// Under other names, as the headers declare some of them otherwise.
#define DEFINE(NAME, name, kind, result, params, args)                      \
    extern "C" result kest_##name params __asm__(kind(#name));              \
    extern "C" result kest_##name params {                                  \
        static auto* const real = next_symbol<result params>(kind(#name));  \
        const void* caller = __builtin_return_address(0);                   \
        return pass_on<faults::NAME, result>(caller, real, ARGUMENTS args); \
    }
#define ARGUMENTS(...) __VA_ARGS__
KEST_CALLS(DEFINE, DEFINE)
