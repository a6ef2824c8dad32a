#include "storage/FileNotifier.h"

#include <errno.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <string.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <memory>
#include <string>
#include <vector>

#include "core/Multiplexer.h"
#include "core/system_paths.h"
#include "storage/copy_file.h"
#include "support/TestRoot.h"

namespace {

// A FIFO stands for the device; the test holds it open for reading and writing.
class FileNotifierTest : public testing::Test {
protected:
    FileNotifierTest() {
        m_root.make_dir("dev");
        const std::string path = m_root.path("dev/audio_dsp_pcm");
        EXPECT_EQ(0, mkfifo(path.c_str(), 0600));
        m_device = ::open(path.c_str(), O_RDWR | O_CLOEXEC);
        EXPECT_GE(m_device, 0);
    }
    ~FileNotifierTest() override { ::close(m_device); }

    void write_device(const char* text) const {
        ASSERT_EQ(static_cast<ssize_t>(strlen(text)), write(m_device, text, strlen(text)));
    }
    // A pass of the loop that does not wait.
    void pass() {
        m_mux.timer_mgr().add_timer(
            0, [](void*) {}, nullptr);
        m_mux.run_once();
    }
    static void on_ready(FileNotifier* notifier, void* client) {
        FileNotifierTest* const self = static_cast<FileNotifierTest*>(client);
        char buf[16];
        const ssize_t n = read(notifier->fd(), buf, sizeof(buf));
        ASSERT_GT(n, 0);
        self->m_received.append(buf, static_cast<size_t>(n));
        if (buf[n - 1] == '!') {
            notifier->close();
        }
    }

    TestRoot m_root;
    int m_device;
    Multiplexer m_mux;
    std::string m_received;
};

class CopyFileTest : public testing::Test {
protected:
    int copy(const std::string& src, const std::string& dst) {
        return copy_file(m_root.path(src).c_str(), m_root.path(dst).c_str());
    }
    TestRoot m_root;
    LogCapture m_log;
};

}  // namespace

TEST_F(FileNotifierTest, CallsBackWhileOpenAndReadable) {
    FileNotifier notifier(nullptr, &m_mux, PATH_AGDSP_PCM);
    EXPECT_EQ(-1, notifier.fd());
    write_device("early");
    ASSERT_EQ(0, notifier.open());
    pass();  // no callback yet: ignored, and reported again
    notifier.set_callback(this, on_ready);
    const int fd = notifier.fd();
    const size_t descriptors = open_descriptors();
    EXPECT_EQ(0, notifier.open());
    EXPECT_EQ(fd, notifier.fd());
    EXPECT_EQ(descriptors, open_descriptors());
    m_mux.run_once();
    EXPECT_EQ("early", m_received);
    pass();
    EXPECT_EQ("early", m_received);

    write_device("-last!");  // the callback closes the notifier
    m_mux.run_once();
    EXPECT_EQ(-1, notifier.fd());
    EXPECT_EQ(descriptors - 1, open_descriptors());
    notifier.close();
    write_device("-again");
    pass();
    EXPECT_EQ("early-last!", m_received);
    ASSERT_EQ(0, notifier.open());
    m_mux.run_once();
    EXPECT_EQ("early-last!-again", m_received);
}

TEST_F(FileNotifierTest, OpenFailuresLeaveItClosed) {
    LogCapture log;
    FileNotifier missing(nullptr, &m_mux, PATH_AGDSP_MEM);
    errno = 0;
    EXPECT_EQ(-1, missing.open());
    EXPECT_EQ(ENOENT, errno);
    EXPECT_EQ(-1, missing.fd());

    std::vector<std::unique_ptr<FileNotifier>> all;
    for (size_t i = 0; i < Multiplexer::MAX_HANDLERS; ++i) {
        all.emplace_back(new FileNotifier(nullptr, &m_mux, PATH_AGDSP_PCM));
        ASSERT_EQ(0, all.back()->open());
    }
    const size_t descriptors = open_descriptors();
    FileNotifier extra(nullptr, &m_mux, PATH_AGDSP_PCM);
    EXPECT_EQ(-1, extra.open());
    EXPECT_EQ(ENOBUFS, errno);
    EXPECT_EQ(-1, extra.fd());
    EXPECT_EQ(descriptors, open_descriptors());
    all.pop_back();
    EXPECT_EQ(0, extra.open());
    EXPECT_EQ("", log.text());
}

TEST_F(CopyFileTest, CopiesWholeFiles) {
    const size_t descriptors = open_descriptors();
    for (size_t len : {0u, 1u, 32767u, 32768u, 32769u, 100000u}) {
        const std::string content = pattern_bytes(len, 3);
        m_root.write_file("data/src", content);
        m_root.write_file("data/old", std::string(50000, 'x'));  // truncated first
        EXPECT_EQ(0, copy("data/src", "data/old")) << len;
        EXPECT_EQ(content, m_root.read_file("data/old")) << len;
    }
    const mode_t mask = umask(0);
    EXPECT_EQ(0, copy("data/src", "data/new"));
    umask(mask);
    struct stat st;
    ASSERT_EQ(0, stat(m_root.path("data/new").c_str(), &st));
    EXPECT_EQ(0644u, st.st_mode & 07777u);
    EXPECT_EQ(100000, st.st_size);
    EXPECT_EQ(descriptors, open_descriptors());
    EXPECT_EQ("", m_log.text());
}

TEST_F(CopyFileTest, OpenFailuresAreLogged) {
    const size_t descriptors = open_descriptors();
    m_root.write_file("data/dst", "kept");
    EXPECT_EQ(-1, copy("data/none", "data/dst"));
    EXPECT_EQ("kept", m_root.read_file("data/dst"));
    EXPECT_TRUE(m_log.has("int copy_file(const char*, const char*): open source file " +
                          m_root.path("data/none") + " failed [2(No such file or directory)]\n"));
    m_log.clear();
    EXPECT_EQ(-1, copy("data/dst", "data/dst/below"));
    EXPECT_TRUE(m_log.has("int copy_file(const char*, const char*): open dest file " +
                          m_root.path("data/dst/below") + " failed [20(Not a directory)]\n"));
    EXPECT_EQ(descriptors, open_descriptors());
}

TEST_F(CopyFileTest, ReadAndWriteErrorsEndTheCopySilently) {
    const size_t descriptors = open_descriptors();
    const std::string content = pattern_bytes(70000, 9);
    m_root.write_file("data/src", content);
    EXPECT_EQ(-1, copy("data", "data/dst"));  // reading a directory fails
    EXPECT_TRUE(m_root.exists("data/dst"));
    EXPECT_EQ(-1, copy_file(m_root.path("data/src").c_str(), "/dev/full"));

    // The second write crosses the file size limit and is short.
    struct rlimit saved;
    ASSERT_EQ(0, getrlimit(RLIMIT_FSIZE, &saved));
    struct rlimit small = saved;
    small.rlim_cur = 40000;
    ASSERT_EQ(0, setrlimit(RLIMIT_FSIZE, &small));
    const int result = copy("data/src", "data/dst");
    ASSERT_EQ(0, setrlimit(RLIMIT_FSIZE, &saved));
    EXPECT_EQ(-1, result);
    EXPECT_EQ(content.substr(0, 40000), m_root.read_file("data/dst"));
    EXPECT_EQ("", m_log.text());
    EXPECT_EQ(descriptors, open_descriptors());
}
