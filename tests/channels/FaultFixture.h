// The crash fixture with a C library that can be made to fail and clocks that can be set.
#ifndef TESTS_CHANNELS_FAULTFIXTURE_H_
#define TESTS_CHANNELS_FAULTFIXTURE_H_

#include "channels/CrashFixture.h"
#include "storage/faults.h"

constexpr time_t NOON = 1456811100;  // 2016-03-01 05:45:00 UTC, 09:15:00 here
const char STAMP[] = "_2016-03-01_09-15-00";

// How far the clock of the timers runs ahead; in transactions_test.
extern int64_t g_clock_ahead_ms;

class FaultFixture : public CrashFixture {
protected:
    FaultFixture() { repair(); }
    ~FaultFixture() override { faults::reset(); }

    // Everything works again, and it is noon.
    static void repair() {
        faults::reset();
        faults::set_time(NOON);
    }
    // Has the timers fire that are due in that time.
    void run_clock(int ms) {
        g_clock_ahead_ms += ms;
        mux().timer_mgr().process_timers();
    }
};

#endif  // TESTS_CHANNELS_FAULTFIXTURE_H_
