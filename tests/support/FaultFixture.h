// SPDX-License-Identifier: Apache-2.0
// The crash fixture with a C library that can be made to fail and clocks set by hand.
#ifndef TESTS_SUPPORT_FAULTFIXTURE_H_
#define TESTS_SUPPORT_FAULTFIXTURE_H_

#include "support/CrashFixture.h"

constexpr time_t NOON = 1456811100;  // 2016-03-01 05:45:00 UTC, 09:15:00 here
const char STAMP[] = "_2016-03-01_09-15-00";

class FaultFixture : public CrashFixture {
protected:
    FaultFixture() { repair(); }
    ~FaultFixture() override {
        faults::reset();
        boot_clock::real();
    }

    // Everything works again, it is noon and the clock of the timers stands still.
    static void repair() {
        faults::reset();
        faults::set_time(NOON);
        boot_clock::freeze();
    }
    // Has the timers fire that are due in that time.
    void run_clock(unsigned int ms) {
        boot_clock::advance(ms);
        mux().timer_mgr().process_timers();
    }
};

#endif  // TESTS_SUPPORT_FAULTFIXTURE_H_
