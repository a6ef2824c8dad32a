#include "storage/LogFile.h"

#include <errno.h>

#include "storage/StorageFixture.h"

namespace {

const std::string REL = "data/modem_log/2016-03-01-09-15-00/cp_wcn/";
const std::string STAMP = "-cp_wcn-2016-03-01_09-15-00.log";

class LogFileTest : public StorageTest {
protected:
    LogFileTest() { start(); }
    ~LogFileTest() override { check_sums(internal()); }

    LogFile* make(const std::string& name = "f") {
        return m_dir->create_file(name.c_str(), LT_LOG);
    }
    std::string content() const { return m_root.read_file(REL + "f"); }
};

TEST_F(LogFileTest, StagingBoundary) {
    const struct {
        size_t staged;
        size_t len;
        int write_calls;
        int writev_calls;
    } cases[] = {{0, 65535, 0, 0},   {0, 65536, 1, 0}, {1, 65534, 0, 0},     {1, 65535, 0, 1},
                 {65000, 536, 0, 1}, {65535, 0, 0, 0}, {65535, 70000, 0, 1}, {0, 0, 0, 0}};
    for (const auto& c : cases) {
        SCOPED_TRACE(std::to_string(c.staged) + "+" + std::to_string(c.len));
        const std::string data = pattern_bytes(c.staged + c.len, 1);
        LogFile* file = make();
        EXPECT_EQ(static_cast<ssize_t>(c.staged), file->write(data.data(), c.staged));
        faults::reset();
        EXPECT_EQ(static_cast<ssize_t>(c.len), file->write(data.data() + c.staged, c.len));
        EXPECT_EQ(c.write_calls, faults::calls(faults::WRITE));
        EXPECT_EQ(c.writev_calls, faults::calls(faults::WRITEV));
        EXPECT_EQ(data.size(), file->size());
        check_sums(internal());
        EXPECT_EQ(0, file->close());
        EXPECT_EQ(0, file->close());
        EXPECT_EQ(data, content());
        m_dir->remove_file(file);
    }
}

// Whatever a short or failing write leaves, the file in the end holds exactly the bytes
// taken, and the next write works.
TEST_F(LogFileTest, ShortAndFailingWrites) {
    const struct {
        size_t staged;
        size_t len;
        int error;
        size_t moved;  // without an error
        ssize_t result;
    } cases[] = {{65000, 1000, 0, 1, 0},     {65000, 1000, 0, 64999, 0}, {65000, 1000, 0, 65000, 0},
                 {65000, 1000, 0, 65001, 1}, {0, 70000, ENOSPC, 0, -2},  {10, 70000, ENOSPC, 0, -2},
                 {10, 70000, EIO, 0, -1}};
    for (const auto& c : cases) {
        SCOPED_TRACE(std::to_string(c.error) + " " + std::to_string(c.moved));
        LogCapture log;
        const std::string data = pattern_bytes(c.staged + c.len, 2);
        LogFile* file = make();
        file->write(data.data(), c.staged);
        const faults::Call call = c.staged ? faults::WRITEV : faults::WRITE;
        c.error ? faults::fail(call, 1, c.error) : faults::shorten(call, c.moved);
        EXPECT_EQ(c.result, file->write(data.data() + c.staged, c.len));
        EXPECT_EQ(c.error ? 1u : 0u, log.count("write(const void*, size_t): write file failed [" +
                                               std::to_string(c.error) + "("));
        const size_t taken = c.staged + (c.error ? 0 : static_cast<size_t>(c.result));
        EXPECT_EQ(taken, file->size());
        EXPECT_EQ(c.moved, content().size());
        EXPECT_EQ(4, file->write("next", 4));
        file->close();
        EXPECT_EQ(data.substr(0, taken) + "next", content());
        m_dir->remove_file(file);
    }
}

TEST_F(LogFileTest, UnbufferedWritesAndFlush) {
    LogFile* file = make();
    const std::string data = pattern_bytes(1000, 5);
    faults::shorten(faults::WRITE, 300);
    EXPECT_EQ(1000, file->write_data(data.data(), data.size()));  // goes on after a short write
    EXPECT_EQ(1000, file->write_raw(data.data(), data.size()));
    faults::fail(faults::WRITE, 1, ENOSPC, 2);
    EXPECT_EQ(-1, file->write_data("x", 1));
    EXPECT_EQ(-2, file->write_raw("x", 1));
    faults::fail(faults::WRITE, 1, EIO);
    EXPECT_EQ(-1, file->write_raw("x", 1));
    faults::shorten(faults::WRITE, 0);
    EXPECT_EQ(-1, file->write_raw("x", 1));  // no endless loop
    EXPECT_EQ(0u, file->size());
    // A failed flush drops what was staged, and the sizes with it.
    file->write("lost", 4);
    faults::shorten(faults::WRITE, 1);
    faults::fail(faults::WRITE, 2, ENOSPC);
    file->flush();
    EXPECT_EQ(1u, file->size());
    check_sums(internal());
    file->write("kept", 4);
    file->flush();
    EXPECT_EQ(data + data + "lkept", content());
    EXPECT_EQ(5u, file->size());
}

TEST_F(LogFileTest, OpenAndClosed) {
    const size_t before = open_descriptors();
    LogFile* file = make();
    EXPECT_EQ(0644u, mode_of(m_root.path(REL + "f")));
    EXPECT_EQ(FD_CLOEXEC, fcntl(file->fd(), F_GETFD));
    EXPECT_EQ(-1, file->open());
    EXPECT_EQ(before + 1, open_descriptors());
    file->write("0123456789", 10);
    file->close();
    file->flush();
    EXPECT_TRUE(file->write("x", 1) == -1 && file->write_data("x", 1) == -1);
    EXPECT_EQ(-1, file->copy("/dev/null"));
    faults::fail(faults::OPEN, 1, ENOSPC);
    EXPECT_EQ(-1, file->open());
    // A link, which a card may hold, does not lead out of the log tree.
    const std::string path = m_root.path(REL + "f"), away = m_root.path("away");
    ASSERT_EQ(0, rename(path.c_str(), away.c_str()) + symlink(away.c_str(), path.c_str()));
    EXPECT_EQ(-1, file->open());
    ASSERT_EQ(0, unlink(path.c_str()) + rename(away.c_str(), path.c_str()));
    // An existing file is written from its start, not cut; the destructor writes out.
    EXPECT_EQ(0, file->open());
    file->write("ab", 2);
    ObjectRef<LogFile> ref(file);
    internal().clear();
    EXPECT_FALSE(ref);
    EXPECT_EQ("ab23456789", content());
    EXPECT_EQ(before, open_descriptors());
}

TEST_F(LogFileTest, RotateRenumberRemove) {
    const std::pair<std::string, std::string> cases[] = {
        {"0", "1"}, {"9", "10"}, {"007", "8"},       {"4294967295", ""},
        {"", ""},   {"x", ""},   {"42949672950", ""}};
    LogCapture log;
    for (const auto& c : cases) {
        LogFile* file = make(c.first + STAMP);
        EXPECT_EQ(c.second.empty() ? -1 : 0, file->rotate(m_dir->path()));
        const std::string expected = (c.second.empty() ? c.first : c.second) + STAMP;
        EXPECT_EQ(expected, file->name().string());
        EXPECT_EQ(Names{expected}, m_root.list(REL));
        m_dir->remove_file(file);
    }
    // A refused rename leaves the old name, in the object and on the medium.
    LogFile* file = make("5" + STAMP);
    faults::fail(faults::RENAME, 1, ENOSPC, 2);
    EXPECT_EQ(-1, file->rotate(m_dir->path()));
    EXPECT_EQ(-1, file->change_name_num(77));
    EXPECT_TRUE(log.has("rotate(const android::String8&): rename 5" + STAMP + " failed [28("));
    EXPECT_TRUE(log.has("rename number in 5" + STAMP + " failed [28("));
    EXPECT_EQ(Names{"5" + STAMP}, m_root.list(REL));
    EXPECT_EQ("5" + STAMP, file->name().string());
    // So does a name that a file has, also one that nobody listed.
    m_root.write_file(REL + "6" + STAMP, "stranger");
    EXPECT_EQ(-1, file->rotate(m_dir->path()));
    EXPECT_TRUE(log.has("rename 5" + STAMP + " failed [17(File exists)]"));
    EXPECT_EQ("stranger", m_root.read_file(REL + "6" + STAMP));
    EXPECT_EQ(0, unlink(m_root.path(REL + "6" + STAMP).c_str()));
    EXPECT_EQ(0, file->change_name_num(77));
    EXPECT_EQ(Names{"77" + STAMP}, m_root.list(REL));
    EXPECT_EQ(0, file->remove(m_dir->path()));
    EXPECT_FALSE(file->exists());
    EXPECT_EQ(0, file->remove(m_dir->path()));
}

}  // namespace
