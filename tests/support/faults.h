// SPDX-License-Identifier: Apache-2.0
// The C library as the tests see it. Every test program is linked so that the calls listed
// in sim/calls.h come to faults.cpp first: the Nth call can be made to fail or to transfer less,
// calls are counted, and a test can put a function of its own in the place of one.
#ifndef TESTS_SUPPORT_FAULTS_H_
#define TESTS_SUPPORT_FAULTS_H_

#include <functional>
#include <limits>
#include <string>

#include "sim/calls.h"

// The C library's own.
namespace real {
#define DECLARE(NAME, name, kind, result, params, args) \
    result name params __asm__("__real_" kind(#name));
KEST_CALLS(DECLARE, DECLARE)
#undef DECLARE
}  // namespace real

namespace faults {

constexpr int FOREVER = std::numeric_limits<int>::max();

// Everything works again, all counters are 0, time() is the real one.
void reset();
// The nth call from now on (1: the next one) and the times - 1 after it fail with error.
void fail(Call call, int nth, int error, int times = 1);
// Only calls on paths with this part in them count from now on; "/modem_log" after a reset.
// Of calls on descriptors those above standard error count.
void only_on(const char* part);
// The next call of write or writev transfers at most max bytes.
void shorten(Call call, size_t max);
// Calls of the kind since the last reset.
int calls(Call call);
// Whether the failure asked for last has happened.
bool hit(Call call);
// What time() returns from now on; 0: the real time; -1: it fails.
void set_time(time_t now);

// The path of an open file, for a function that runs instead.
std::string path_of(int fd);

// Functions of the test's that run instead, as long as they are set.
struct Instead {
#define MEMBER(NAME, name, kind, result, params, args) std::function<result params> name;
    KEST_CALLS(MEMBER, MEMBER)
#undef MEMBER
};
extern Instead instead;

}  // namespace faults

// The clock of the timers, CLOCK_BOOTTIME: moved by hand, so that time-outs of seconds pass
// at once. Every other clock stays real.
namespace boot_clock {

// Runs with the real time, the state at first.
void real();
// Stands still, at a time just before a full second.
void freeze();
// Moves the standing clock on.
void advance(unsigned int ms);
// Cannot be read: EINVAL.
void fail();

}  // namespace boot_clock

#endif  // TESTS_SUPPORT_FAULTS_H_
