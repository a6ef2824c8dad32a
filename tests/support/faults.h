// SPDX-License-Identifier: Apache-2.0
// Faults of the C library for the storage tests, linked with --wrap: the n-th call of a
// kind fails or transfers less. Only calls on the log tree count (a path with "/modem_log"
// in it; for write and writev any descriptor above standard error). Also the clock of the
// names and a record of commands.
#ifndef TESTS_SUPPORT_FAULTS_H_
#define TESTS_SUPPORT_FAULTS_H_

#include <stddef.h>
#include <time.h>

#include <string>
#include <vector>

namespace faults {

enum Call { WRITE, WRITEV, OPEN, MKDIR, RENAME, UNLINK, ACCESS, NUM_CALLS };

// Everything works again, all counters are 0, time() is the real one.
void reset();
// The nth call from now on (1: the next one) and the times - 1 after it fail with error.
void fail(Call call, int nth, int error, int times = 1);
// Only calls on paths with this part in them count from now on; "/modem_log" after a reset.
void only_on(const char* part);
// The next call of write or writev transfers at most max bytes.
void shorten(Call call, size_t max);
// Calls of the kind since the last reset.
int calls(Call call);
// Whether the failure asked for last has happened.
bool hit(Call call);
// What time() returns from now on; 0: the real time; -1: it fails.
void set_time(time_t now);
// The commands given to system() since the last reset; they are really run.
const std::vector<std::string>& commands();

}  // namespace faults

#endif  // TESTS_SUPPORT_FAULTS_H_
