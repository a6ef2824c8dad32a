#include <atomic>

#include "channels/ChannelFixture.h"
#include "channels/TimeSyncRecord.h"

namespace {

std::atomic<int> g_connects{0};
time_t g_now = 0;  // what the clock says; 0: the real time, -1: it cannot be read

}  // namespace

extern "C" int __real_connect(int fd, const struct sockaddr* address, socklen_t len);
extern "C" int __wrap_connect(int fd, const struct sockaddr* address, socklen_t len) {
    ++g_connects;
    return __real_connect(fd, address, len);
}
extern "C" time_t __real_time(time_t* t);
extern "C" time_t __wrap_time(time_t* t) {
    return g_now ? (t ? *t = g_now : g_now) : __real_time(t);
}

namespace {

const std::string TAG("\x78\x56\x34\x12");

// A service whose accept queue is full already, and that never looks at it.
class Hanging {
public:
    explicit Hanging(const char* name)
        : m_server(socket_local_server(name, ANDROID_SOCKET_NAMESPACE_ABSTRACT, SOCK_STREAM)) {
        listen(m_server, 0);
        m_queued = socket_local_client(name, ANDROID_SOCKET_NAMESPACE_ABSTRACT, SOCK_STREAM);
    }
    ~Hanging() {
        close(m_queued);
        close(m_server);
    }

private:
    int m_server;
    int m_queued;
};

class TimeSyncTest : public ChannelFixture {
protected:
    TimeSyncTest() { set_zone("UTC0"); }
    ~TimeSyncTest() override { set_zone("UTC0"); }

    static void set_zone(const char* tz) {
        setenv("TZ", tz, 1);
        tzset();
        g_now = 0;
    }
    // Has a modem start one log file with the data "log". The file's content.
    std::string start_file() {
        const Fifo fifo(root.path("log_w"));
        EXPECT_EQ(boot("stream cp_wcdma on 5 3\n"), 0);
        log.clear();
        g_connects = 0;
        const int64_t start = monotonic_ms();
        EXPECT_TRUE(feed(fifo, "log"));
        took = monotonic_ms() - start;
        ctrl.reset();
        const std::string result = content("cp_wcdma");
        remove_tree("data/modem_log");
        return result;
    }

    int64_t took = 0;  // ms for the data
};

TEST_F(TimeSyncTest, TheTimeServiceMayFailInEveryWay) {
    const std::string reply("\1\2\3\4abcdefgh");
    const std::string record = TAG + reply;
    const char NO_SERVER[] = "save_timestamp(LogFile*): connect CP time sync server error [111(";
    const char NO_INFO[] = "save_timestamp(LogFile*): can not read time info [";
    const struct {
        const char* what;
        std::string reply;
        int listen_ms, answer_ms;  // listening -1: never
        std::string head;
        const char* message;
        int min_ms, max_ms;
    } cases[] = {
        {"more than 12 bytes", reply + "more", 0, 0, record, "", 0, 900},
        {"absent", "", -1, 0, "", NO_SERVER, 1000, 1500},
        {"late in both", reply, 450, 900, "", NO_INFO, 1000, 1340},
        {"listening late", reply, 350, 0, record, "", 350, 1300},
        {"11 bytes", reply.substr(0, 11), 0, 0, "", NO_INFO, 0, 900},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        std::unique_ptr<TimeServer> server;
        if (c.listen_ms >= 0) {
            server = std::make_unique<TimeServer>(c.reply, c.listen_ms, c.answer_ms);
        }
        EXPECT_EQ(start_file(), c.head + "log");
        EXPECT_EQ(log.count("save_timestamp"), *c.message ? 1u : 0u) << log.text();
        EXPECT_TRUE(log.has(c.message));
        EXPECT_GE(took, c.min_ms);
        EXPECT_LE(took, c.max_ms);
        if (c.listen_ms <= 0) {
            EXPECT_EQ(g_connects, c.listen_ms < 0 ? 10 : 1);
        }
    }
}

TEST_F(TimeSyncTest, HangingServicesDoNotBlockTheLoop) {
    const Hanging services[] = {Hanging("cp_time_sync_server"), Hanging("modemd"),
                                Hanging("external_wcn_kest")};
    const int64_t start = monotonic_ms();
    EXPECT_EQ(start_file(), "log");
    EXPECT_LE(monotonic_ms() - start, 2500);
    EXPECT_TRUE(log.has("connect CP time sync server error [11(")) << log.text();
}

TEST_F(TimeSyncTest, RecordAddsTheZoneModulo32Bits) {
    const struct {
        const char* tz;
        std::string seconds, local;
    } cases[] = {
        {"XXX-8", std::string("\x40\x42\x0f\0", 4), std::string("\xc0\xb2\x0f\0", 4)},  // 1000000
        {"XXX+5", std::string("\x40\x42\x0f\0", 4), std::string("\xf0\xfb\x0e\0", 4)},
        {"XXX-1", "\xff\xff\xff\xff", std::string("\x0f\x0e\0\0", 4)},
        {"XXX+1", std::string(4, '\0'), "\xf0\xf1\xff\xff"},
    };
    for (const auto& c : cases) {
        const TimeServer server(c.seconds + "abcdefgh");
        set_zone(c.tz);
        EXPECT_EQ(start_file(), TAG + c.local + "abcdefghlog") << c.tz;
    }
}

TEST_F(TimeSyncTest, ZoneIsTheDifferenceOfTheHoursFoldedAtMidnight) {
    const time_t day = 1700006400;  // a midnight in UTC
    const struct {
        const char* tz;
        int hour, minute, zone;
    } cases[] = {
        // clang-format off
        {"UTC0", 0, 0, 0},        {"XXX-8", 3, 0, 8},       {"XXX-8", 20, 0, 8},
        {"XXX+8", 3, 0, -8},      {"XXX-11", 14, 0, 11},    {"XXX+11", 2, 0, -11},
        {"IST-5:30", 10, 29, 5},  {"IST-5:30", 10, 30, 6},  {"NST+3:30", 12, 10, -4},
        // Twelve hours apart is not folded; more than twelve hours always is.
        {"XXX-12", 3, 0, 12},     {"XXX-12", 15, 0, -12},   {"XXX-14", 3, 0, -10},
        // clang-format on
    };
    for (const auto& c : cases) {
        set_zone(c.tz);
        g_now = day + c.hour * 3600 + c.minute * 60;
        EXPECT_EQ(time_zone_hours(), c.zone) << c.tz << " at " << c.hour << ":" << c.minute;
    }
    g_now = -1;
    EXPECT_EQ(time_zone_hours(), 0);
}

}  // namespace
