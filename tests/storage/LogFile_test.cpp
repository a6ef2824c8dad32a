// SPDX-License-Identifier: Apache-2.0

#include "storage/LogFile.h"

#include <errno.h>

#include "storage/StorageFixture.h"

namespace {

const std::string REL = "data/modem_log/2016-03-01-09-15-00/cp_wcn/";
const std::string STAMP = "-cp_wcn-2016-03-01_09-15-00.log";

class LogFileTest : public StorageTest {
protected:
    void SetUp() override { start(); }
    ~LogFileTest() override { check_sums(internal()); }

    LogFile* make(const std::string& name = "f") {
        return m_dir->create_file(name.c_str(), LT_LOG);
    }
    std::string content() const { return m_root.read_file(REL + "f"); }
};

TEST_F(LogFileTest, UnbufferedWritesAndFlush) {
    LogCapture log;
    const size_t descriptors = open_descriptors();
    LogFile* file = make();
    const std::string data = pattern_bytes(1000, 5);
    faults::shorten(faults::WRITE, 300);
    EXPECT_EQ(file->write_data(data.data(), data.size()), 1000);  // goes on after a short write
    EXPECT_EQ(file->write_raw(data.data(), data.size()), 1000);
    faults::fail(faults::WRITE, 1, ENOSPC, 2);
    EXPECT_EQ(file->write_data("x", 1), -1);
    EXPECT_EQ(file->write_raw("x", 1), -2);
    faults::fail(faults::WRITE, 1, EIO);
    EXPECT_EQ(file->write_raw("x", 1), -1);
    faults::shorten(faults::WRITE, 0);
    EXPECT_EQ(file->write_raw("x", 1), -1);  // no endless loop
    EXPECT_EQ(file->size(), 0u);
    // A failed flush drops what was staged, and the sizes with it.
    file->write("lost", 4);
    faults::shorten(faults::WRITE, 1);
    faults::fail(faults::WRITE, 2, ENOSPC);
    file->flush();
    EXPECT_EQ(file->size(), 1u);
    check_sums(internal());
    file->write("kept", 4);
    faults::fail(faults::WRITEV, 1, ENOSPC);
    EXPECT_EQ(file->write(std::string(70000, 'x').data(), 70000), LogFile::FULL);
    file->flush();
    EXPECT_EQ(content(), data + data + "lkept");
    EXPECT_EQ(file->size(), 5u);
    file->write("lost", 4);
    faults::fail(faults::WRITE, 1, ENOSPC);
    file->close();
    EXPECT_TRUE(log.has("close(): what was staged of f is lost [28(")) << log.text();
    EXPECT_EQ(open_descriptors(), descriptors);
}

TEST_F(LogFileTest, OpenAndClosed) {
    const size_t before = open_descriptors();
    LogFile* file = make();
    EXPECT_EQ(fcntl(file->fd(), F_GETFD), FD_CLOEXEC);
    EXPECT_EQ(file->open(), -1);
    EXPECT_EQ(open_descriptors(), before + 1);
    file->write("0123456789", 10);
    file->close();
    file->flush();
    EXPECT_TRUE(file->write("x", 1) == -1 && file->write_data("x", 1) == -1);
    EXPECT_EQ(file->copy("/dev/null"), -1);
    faults::fail(faults::OPEN, 1, ENOSPC);
    EXPECT_EQ(file->open(), -1);
    // A link, which a card may hold, does not lead out of the log tree.
    const std::string path = m_root.path(REL + "f"), away = m_root.path("away");
    ASSERT_EQ(rename(path.c_str(), away.c_str()) + symlink(away.c_str(), path.c_str()), 0);
    EXPECT_EQ(file->open(), -1);
    ASSERT_EQ(unlink(path.c_str()) + rename(away.c_str(), path.c_str()), 0);
    // An existing file is written from its start, not cut; the destructor writes out.
    EXPECT_EQ(file->open(), 0);
    file->write("ab", 2);
    ObjectRef<LogFile> ref(file);
    internal().clear();
    EXPECT_FALSE(ref);
    EXPECT_EQ(content(), "ab23456789");
    EXPECT_EQ(open_descriptors(), before);
}

// A file of the kernel may say the same for ever.
TEST_F(LogFileTest, ACopyHasAnEnd) {
    LogFile* file = make();
    m_root.write_file("mem", "x");
    faults::instead.read = [](int, void*, size_t len) { return static_cast<ssize_t>(len); };
    faults::instead.write = [](int, const void*, size_t len) { return static_cast<ssize_t>(len); };
    EXPECT_EQ(file->copy(m_root.path("mem").c_str()), -1);
    faults::instead = {};
    EXPECT_EQ(errno, EFBIG);
    EXPECT_EQ(file->counted(), 0xFFFFFFFFu);
}

TEST_F(LogFileTest, RotateRenumberRemove) {
    const struct {
        std::string number, next;
    } cases[] = {{"007", "8"}, {"4294967295", ""}, {"x", ""}, {"42949672950", ""}};
    LogCapture log;
    for (const auto& c : cases) {
        LogFile* file = make(c.number + STAMP);
        EXPECT_EQ(file->rotate(m_dir->path()), c.next.empty() ? -1 : 0);
        const std::string expected = (c.next.empty() ? c.number : c.next) + STAMP;
        EXPECT_EQ(file->name().string(), expected);
        EXPECT_EQ(m_root.list(REL), Names{expected});
        m_dir->remove_file(file);
    }
    // A refused rename leaves the old name, in the object and on the medium.
    LogFile* file = make("5" + STAMP);
    faults::fail(faults::RENAME, 1, ENOSPC, 2);
    EXPECT_EQ(file->rotate(m_dir->path()), -1);
    EXPECT_EQ(file->change_name_num(77), -1);
    EXPECT_TRUE(log.has("rotate(const android::String8&): rename 5" + STAMP + " failed [28("));
    EXPECT_TRUE(log.has("rename number in 5" + STAMP + " failed [28("));
    EXPECT_EQ(m_root.list(REL), Names{"5" + STAMP});
    EXPECT_EQ(file->name().string(), "5" + STAMP);
    // So does a name that a file has, also one that nobody listed.
    m_root.write_file(REL + "6" + STAMP, "stranger");
    EXPECT_EQ(file->rotate(m_dir->path()), -1);
    EXPECT_TRUE(log.has("rename 5" + STAMP + " failed [17(File exists)]"));
    EXPECT_EQ(m_root.read_file(REL + "6" + STAMP), "stranger");
    EXPECT_EQ(unlink(m_root.path(REL + "6" + STAMP).c_str()), 0);
    EXPECT_EQ(file->change_name_num(77), 0);
    EXPECT_EQ(m_root.list(REL), Names{"77" + STAMP});
    EXPECT_EQ(file->remove(m_dir->path()), 0);
    EXPECT_FALSE(file->exists());
    EXPECT_EQ(file->remove(m_dir->path()), 0);
}

}  // namespace
