// SPDX-License-Identifier: Apache-2.0

#include "storage/FileNotifier.h"

#include <errno.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <string>

#include "core/Multiplexer.h"
#include "core/system_paths.h"
#include "support/TestRoot.h"
#include "support/faults.h"

namespace {

// Reads what came; a "!" at the end closes the notifier.
void on_ready(FileNotifier* notifier, void* client) {
    char buf[16];
    const ssize_t n = read(notifier->fd(), buf, sizeof(buf));
    ASSERT_GT(n, 0);
    static_cast<std::string*>(client)->append(buf, static_cast<size_t>(n));
    if (buf[n - 1] == '!') {
        notifier->close();
    }
}

// A FIFO stands for the device; the test holds it open for reading and writing.
TEST(FileNotifier, CallsBackWhileOpenAndReadable) {
    TestRoot root;
    LogCapture log;
    Multiplexer mux;
    root.make_dir("dev");
    ASSERT_EQ(mkfifo(root.path("dev/audio_dsp_pcm").c_str(), 0600), 0);
    FileNotifier notifier(nullptr, &mux, PATH_AGDSP_PCM);
    ASSERT_EQ(notifier.open(), 0);  // waits for no writer
    const int device = open(root.path("dev/audio_dsp_pcm").c_str(), O_RDWR | O_CLOEXEC);
    auto pass = [&](const std::string& written) {
        EXPECT_EQ(write(device, written.data(), written.size()),
                  static_cast<ssize_t>(written.size()));
        mux.timer_mgr().add_timer(
            0, [](void*) {}, nullptr);  // not to wait
        mux.run_once();
    };
    pass("early");  // no callback yet: ignored, and reported again, but not without end
    for (int i = 0; i < 20; ++i) {
        pass("");
    }
    EXPECT_TRUE(notifier.resting());
    notifier.note_alive();
    std::string received;
    notifier.set_callback(&received, on_ready);
    const size_t descriptors = open_descriptors();
    EXPECT_EQ(notifier.open(), 0);  // it is open
    EXPECT_EQ(open_descriptors(), descriptors);
    pass("-last!");
    EXPECT_EQ(notifier.fd(), -1);
    EXPECT_EQ(open_descriptors(), descriptors - 1);
    pass("-again");
    EXPECT_EQ(received, "early-last!");
    FileNotifier missing(nullptr, &mux, PATH_AGDSP_MEM);
    EXPECT_TRUE(missing.open() == -1 && errno == ENOENT && missing.fd() == -1);
    close(device);
}

}  // namespace
