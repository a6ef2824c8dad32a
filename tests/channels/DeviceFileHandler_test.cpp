// SPDX-License-Identifier: Apache-2.0

#include "channels/DeviceFileHandler.h"

#include "support/ServiceFixture.h"

namespace {

// Keeps what it reads and asks for more unless told otherwise.
class Recorder : public DeviceFileHandler {
public:
    using DeviceFileHandler::DeviceFileHandler;

    void process(int events) override {
        ++passes;
        DeviceFileHandler::process(events);
    }
    bool process_data(DataBuffer& buf) override {
        received.append(reinterpret_cast<const char*>(buf.data()), buf.data_len);
        buf.consume_all();
        return stop_after_chunk;
    }

    std::string received;
    int passes = 0;
    bool stop_after_chunk = false;
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
        bool stop_after_chunk;
        int passes;
    } cases[] = {{8192, false, 1}, {8192, true, 7}, {2500, false, 3}};
    for (const auto& c : cases) {
        auto handler = make(c.capacity);
        handler->stop_after_chunk = c.stop_after_chunk;
        ASSERT_TRUE(fifo.put(data));
        ASSERT_TRUE(pump_until(mux, [&] { return handler->received.size() == data.size(); }));
        EXPECT_TRUE(handler->received == data);
        EXPECT_EQ(handler->passes, c.passes);
    }
    EXPECT_EQ(log.text(), "");
}

TEST_F(DeviceFileHandlerTest, ReportsFailuresButForRepeatsAndEndsInARest) {
    root.write_file("diag", "");
    auto handler = make(100);
    const struct {
        int events;
        size_t lines;  // in all
    } wakeups[] = {{POLLIN, 1}, {POLLIN, 1},  {POLLHUP, 2}, {POLLHUP, 2}, {POLLHUP | POLLERR, 3},
                   {POLLIN, 4}, {POLLHUP, 5}, {POLLHUP, 5}, {POLLHUP, 5}};
    for (const auto& wakeup : wakeups) {
        handler->process(wakeup.events);
        EXPECT_EQ(log.count("\n"), wakeup.lines) << log.text();
    }
    EXPECT_EQ(log.count("void DeviceFileHandler::process(int): read " + path + " return 0 ["), 2u);
    EXPECT_EQ(log.count(path + " unexpected event 0x10 ["), 2u);
    EXPECT_FALSE(handler->resting());
    pump_once(mux);
    EXPECT_TRUE(handler->resting());
    root.write_file("diag", "data");
    handler->process(POLLIN);
    EXPECT_EQ(handler->received, "data");
    EXPECT_FALSE(handler->resting());
    EXPECT_EQ(log.count(path + " return 0 ["), 4u) << "and the end of the file, once more";
}

}  // namespace
