// SPDX-License-Identifier: Apache-2.0

#include <list>

#include "channels/TimeSyncRecord.h"
#include "sim/SimSupervisor.h"
#include "sim/local_socket.h"
#include "support/ServiceFixture.h"

namespace {

// A service that never looks at its connections and has no room for more.
class FullService : public SimSupervisor {
public:
    explicit FullService(const char* name) {
        EXPECT_TRUE(start(name, getenv("KESTMODEM_ROOT")));
        for (int fd; (fd = connect_local(name, getenv("KESTMODEM_ROOT"))) >= 0;) {
            m_queued.emplace_back(fd);
        }
    }

private:
    std::list<Client> m_queued;
};

class TimeSyncTest : public ChannelFixture {
protected:
    ~TimeSyncTest() override {
        faults::reset();
        faults::instead = {};
        set_zone("UTC0");
    }
};

// It would wait for ever.
TEST_F(TimeSyncTest, HangingServicesDoNotBlockTheLoop) {
    FullService time_service("cp_time_sync_server"), modemd("modemd"), wcnd("external_wcn_kest");
    const Fifo fifo(root.path("log_w"));
    useconds_t waited = 0;
    faults::instead.usleep = [&](useconds_t us) { return waited += us, 0; };
    EXPECT_EQ(boot("stream cp_wcdma on 5 3\n"), 0);
    EXPECT_TRUE(feed(fifo, "log"));
    ctrl->flush();
    EXPECT_EQ(content("cp_wcdma"), "log");
    EXPECT_TRUE(log.has("connect CP time sync server error [11(")) << log.text();
    EXPECT_EQ(waited, 1000000u);
}

TEST_F(TimeSyncTest, ZoneIsTheDifferenceOfTheHoursFoldedAtMidnight) {
    const time_t midnight = 1700006400;  // in UTC
    const struct {
        const char* tz;
        int hour, minute, zone;
    } cases[] = {
        {"XXX-8", 3, 0, 8},
        {"XXX-8", 20, 0, 8},    // the next day there
        {"XXX+11", 2, 0, -11},  // the day before
        {"IST-5:30", 10, 29, 5},
        {"IST-5:30", 10, 30, 6},
        // Twelve hours apart is not folded; more than twelve hours always is.
        {"XXX-12", 3, 0, 12},
        {"XXX-12", 15, 0, -12},
        {"XXX-14", 3, 0, -10},
    };
    for (const auto& c : cases) {
        set_zone(c.tz);
        faults::set_time(midnight + c.hour * 3600 + c.minute * 60);
        EXPECT_EQ(time_zone_hours(), c.zone) << c.tz << " at " << c.hour << ":" << c.minute;
        EXPECT_EQ(make_time_sync_record({1, 0, 1, 0}, c.zone).seconds,
                  0x10001u + 3600u * static_cast<uint32_t>(c.zone));
    }
    faults::set_time(-1);
    EXPECT_EQ(time_zone_hours(), 0);
}

}  // namespace
