// SPDX-License-Identifier: Apache-2.0
// The clock of the timers under the test's control: a test program that takes boot_clock.cpp
// among its sources and clock_gettime into its WRAP list moves CLOCK_BOOTTIME by hand, so
// that time-outs of seconds pass at once. Every other clock stays real.
#ifndef TESTS_SUPPORT_BOOT_CLOCK_H_
#define TESTS_SUPPORT_BOOT_CLOCK_H_

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

#endif  // TESTS_SUPPORT_BOOT_CLOCK_H_
