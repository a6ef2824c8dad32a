#include "channels/DeviceFileHandler.h"

#include "channels/ChannelFixture.h"

namespace {

// Keeps what it reads; consumes it all and asks for more unless told otherwise.
class Recorder : public DeviceFileHandler {
public:
    using DeviceFileHandler::DeviceFileHandler;

    void process(int events) override {
        ++passes;
        DeviceFileHandler::process(events);
    }
    bool process_data(DataBuffer& buf) override {
        ++chunks;
        if (keep) {
            return false;
        }
        received.append(reinterpret_cast<const char*>(buf.data()), buf.data_len);
        buf.consume_all();
        return stop_after_chunk;
    }

    std::string received;
    int passes = 0;
    int chunks = 0;
    bool stop_after_chunk = false;
    bool keep = false;  // leave the data in the buffer
};

class DeviceFileHandlerTest : public testing::Test {
protected:
    std::unique_ptr<Recorder> make(size_t capacity) {
        auto handler =
            std::make_unique<Recorder>(android::String8(path.c_str()), capacity, nullptr, &mux);
        EXPECT_GE(handler->open(), 0);
        EXPECT_EQ(handler->add_events(POLLIN), 0);
        return handler;
    }

    TestRoot root;
    LogCapture log;
    Multiplexer mux;
    const std::string path = root.path("diag");
};

TEST_F(DeviceFileHandlerTest, OneWakeUpDrainsTheDeviceUnlessItIsToldToStopOrHasReadMuch) {
    const Fifo fifo(path);
    const std::string data = pattern_bytes(50000, 1);
    const struct {
        size_t capacity;
        bool stop;
        int chunks, passes;
    } cases[] = {{8192, false, 7, 1}, {8192, true, 7, 7}, {2500, false, 20, 3}};
    for (const auto& c : cases) {
        auto handler = make(c.capacity);
        EXPECT_EQ(fcntl(handler->fd(), F_GETFL) & (O_ACCMODE | O_NONBLOCK), O_RDWR | O_NONBLOCK);
        handler->stop_after_chunk = c.stop;
        ASSERT_TRUE(fifo.put(data));
        ASSERT_TRUE(pump_until(mux, [&] { return handler->received.size() == data.size(); }));
        EXPECT_TRUE(handler->received == data);
        EXPECT_EQ(handler->passes, c.passes);
        EXPECT_EQ(handler->chunks, c.chunks);
    }
    auto handler = make(10);
    handler->keep = true;
    ASSERT_TRUE(fifo.put("abcd"));
    ASSERT_TRUE(pump_until(mux, [&] { return handler->chunks == 1; }));
    handler->keep = false;
    ASSERT_TRUE(fifo.put("efg"));
    ASSERT_TRUE(pump_until(mux, [&] { return handler->chunks == 2; }));
    EXPECT_EQ(handler->received, "abcdefg");
    EXPECT_EQ(log.text(), "");
}

TEST_F(DeviceFileHandlerTest, ReportsFailuresButForRepeatsAndEndsInARest) {
    root.write_file("diag", "");
    auto handler = make(100);
    size_t lines = 0;
    int last = 0;
    for (int events :
         {POLLIN, POLLIN, POLLHUP, POLLHUP, POLLHUP | POLLERR, POLLIN, POLLHUP, POLLHUP, POLLHUP}) {
        lines += events != last;
        last = events;
        handler->process(events);
        EXPECT_EQ(log.count("\n"), lines) << log.text();
    }
    EXPECT_EQ(log.count("void DeviceFileHandler::process(int): read " + path + " return 0 ["), 2u);
    EXPECT_EQ(log.count(path + " unexpected event 0x10 ["), 2u);
    EXPECT_FALSE(handler->resting());
    pump_once(mux);
    EXPECT_TRUE(handler->resting());
    EXPECT_EQ(Filler::free_slots(mux), Multiplexer::MAX_HANDLERS - 1) << "still registered";
    root.write_file("diag", "data");
    handler->process(POLLIN);
    EXPECT_EQ(handler->received, "data");
    EXPECT_FALSE(handler->resting());
    EXPECT_EQ(log.count(path + " return 0 ["), 4u) << "and the end of the file, once more";

    const size_t before = open_descriptors();
    int fds[2];
    ASSERT_EQ(pipe2(fds, O_CLOEXEC | O_NONBLOCK), 0);
    {
        Recorder idle(fds[0], 100, nullptr, &mux);
        Recorder unreadable(fds[1], 100, nullptr, &mux);
        log.clear();
        idle.process(POLLIN);
        EXPECT_EQ(log.text(), "") << "no data is no failure";
        EXPECT_EQ(idle.idle_wakeups(), 1u) << "but there should have been some";
        idle.process(POLLHUP | POLLERR);
        EXPECT_TRUE(log.has(": file  unexpected event 0x18 ["));
        unreadable.process(POLLIN);
        unreadable.process(POLLIN);
        EXPECT_EQ(log.count(": read  error [9(Bad file descriptor)]"), 1u);
        ASSERT_EQ(idle.add_events(POLLIN | POLLOUT), 0);
        handler.reset();
    }
    EXPECT_EQ(Filler::free_slots(mux), Multiplexer::MAX_HANDLERS);
    EXPECT_EQ(open_descriptors(), before + 1) << "its own device closed, the borrowed ones open";
    close(fds[0]);
    close(fds[1]);
}

}  // namespace
