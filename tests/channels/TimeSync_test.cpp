// SPDX-License-Identifier: Apache-2.0

#include <sys/un.h>

#include <list>

#include "channels/TimeSyncRecord.h"
#include "sim/SimSupervisor.h"
#include "sim/local_socket.h"
#include "support/ServiceFixture.h"
#include "support/faults.h"

namespace {

const std::string TAG("\x78\x56\x34\x12");

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
    TimeSyncTest() {
        set_zone("UTC0");
        faults::instead.connect = [this](int fd, const struct sockaddr* address, socklen_t len) {
            const char* name = reinterpret_cast<const struct sockaddr_un*>(address)->sun_path;
            const int result = real::connect(fd, address, len);
            loop.connected = result == 0 &&
                             std::string(name + 1, len - 3).find("time_sync") != std::string::npos;
            return result;
        };
        faults::instead.usleep = [this](useconds_t us) {
            if (us < 10000) {  // the test's own
                return real::usleep(us);
            }
            loop.slept += us;
            loop.on_sleep();
            return 0;
        };
        faults::instead.poll = [this](struct pollfd* fds, nfds_t num, int timeout) {
            if (pthread_equal(pthread_self(), main) && loop.connected) {
                loop.connected = false;
                loop.waited = timeout;
                timeout = loop.answers ? -1 : 0;
            }
            return real::poll(fds, num, timeout);
        };
    }
    ~TimeSyncTest() override {
        faults::instead = {};
        faults::reset();
        set_zone("UTC0");
    }

    // Has a modem start one log file with the data "log". The file's content.
    std::string start_file() {
        const Fifo fifo(root.path("log_w"));
        EXPECT_EQ(boot("stream cp_wcdma on 5 3\n"), 0);
        log.clear();
        EXPECT_TRUE(feed(fifo, "log"));
        ctrl.reset();
        const std::string result = content("cp_wcdma");
        remove_tree("data/modem_log");
        return result;
    }

    // What the loop's thread does for one record, and what happens meanwhile. Its sleeps pass
    // at once; its wait for the answer ends with it, or at once when there will be none.
    struct Record {
        useconds_t slept = 0;
        bool connected = false;  // what is polled next is the connection
        int waited = -1;         // the time-out of the wait for the answer
        std::function<void()> on_sleep = [] {};
        bool answers = true;
    } loop;
    const pthread_t main = pthread_self();
};

// It would wait for ever.
TEST_F(TimeSyncTest, HangingServicesDoNotBlockTheLoop) {
    FullService time_service("cp_time_sync_server"), modemd("modemd"), wcnd("external_wcn_kest");
    EXPECT_EQ(start_file(), "log");
    EXPECT_TRUE(log.has("connect CP time sync server error [11(")) << log.text();
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
    }
    faults::set_time(-1);
    EXPECT_EQ(time_zone_hours(), 0);
}

}  // namespace
