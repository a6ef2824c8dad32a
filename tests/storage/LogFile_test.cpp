#include "storage/LogFile.h"

#include <errno.h>

#include "storage/StorageFixture.h"

namespace {

const char REL[] = "data/modem_log/2016-03-01-09-15-00/cp_wcn/";
const std::string STAMP = "-cp_wcn-2016-03-01_09-15-00.log";

class LogFileTest : public StorageTest {
protected:
    LogFileTest() {
        init();
        bool new_dir = false;
        m_dir = internal().create_cp_set()->prepare_cp_dir("cp_wcn", new_dir);
        EXPECT_NE(nullptr, m_dir);
    }
    ~LogFileTest() override { check_sums(internal()); }

    LogFile* make(const char* name) { return m_dir->create_file(name, LT_LOG); }
    std::string content(const char* name) const {
        return m_root.read_file(REL + std::string(name));
    }

    CpDirectory* m_dir;
};

TEST_F(LogFileTest, StagingBoundary) {
    const struct {
        size_t staged;
        size_t len;
        int write_calls;
        int writev_calls;
    } cases[] = {
        {0, 1, 0, 0},     {0, 65535, 0, 0}, {0, 65536, 1, 0},     {0, 200000, 1, 0},
        {1, 65534, 0, 0}, {1, 65535, 0, 1}, {65000, 535, 0, 0},   {65000, 536, 0, 1},
        {65535, 0, 0, 0}, {65535, 1, 0, 1}, {65535, 70000, 0, 1}, {0, 0, 0, 0},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(std::to_string(c.staged) + "+" + std::to_string(c.len));
        const std::string data = pattern_bytes(c.staged + c.len, 1);
        LogFile* file = make("f");
        EXPECT_EQ(static_cast<ssize_t>(c.staged), file->write(data.data(), c.staged));
        faults::reset();
        EXPECT_EQ(static_cast<ssize_t>(c.len), file->write(data.data() + c.staged, c.len));
        EXPECT_EQ(c.write_calls, faults::calls(faults::WRITE));
        EXPECT_EQ(c.writev_calls, faults::calls(faults::WRITEV));
        EXPECT_EQ(data.size(), file->size());
        EXPECT_EQ(data.size(), internal().size());
        EXPECT_EQ(0, file->close());
        EXPECT_EQ(0, file->close());
        EXPECT_EQ(data, content("f"));
        EXPECT_EQ(0, m_dir->remove_file(file));
        EXPECT_EQ(0u, internal().size());
    }
}

// Whatever a short writev leaves, the file in the end holds exactly the bytes taken.
TEST_F(LogFileTest, ShortWritev) {
    const std::string staged = pattern_bytes(65000, 2);
    const std::string data = pattern_bytes(1000, 3);
    const struct {
        size_t moved;
        ssize_t result;
    } cases[] = {{0, 0}, {1, 0}, {64999, 0}, {65000, 0}, {65001, 1}, {65999, 999}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.moved);
        LogFile* file = make("f");
        file->write(staged.data(), staged.size());
        faults::shorten(faults::WRITEV, c.moved);
        EXPECT_EQ(c.result, file->write(data.data(), data.size()));
        const size_t taken = static_cast<size_t>(c.result);
        EXPECT_EQ(staged.size() + taken, file->size());
        EXPECT_EQ(c.moved, content("f").size());
        EXPECT_EQ(4, file->write("next", 4));
        file->close();
        EXPECT_EQ(staged + data.substr(0, taken) + "next", content("f"));
        m_dir->remove_file(file);
    }
}

TEST_F(LogFileTest, WriteErrors) {
    const std::string big = pattern_bytes(70000, 4);
    const struct {
        size_t staged;
        faults::Call call;
        int error;
        ssize_t result;
    } cases[] = {{0, faults::WRITE, ENOSPC, -2},
                 {0, faults::WRITE, EIO, -1},
                 {10, faults::WRITEV, ENOSPC, -2},
                 {10, faults::WRITEV, EIO, -1}};
    for (const auto& c : cases) {
        LogCapture log;
        LogFile* file = make("f");
        file->write(big.data(), c.staged);
        faults::fail(c.call, 1, c.error);
        EXPECT_EQ(c.result, file->write(big.data(), big.size()));
        EXPECT_EQ(1u, log.count("ssize_t LogFile::write(const void*, size_t): write file failed [" +
                                std::to_string(c.error) + "(" + strerror(c.error) + ")]\n"));
        EXPECT_EQ(c.staged, file->size());
        // What was staged is still there, and the next write works.
        EXPECT_EQ(70000, file->write(big.data(), big.size()));
        file->close();
        EXPECT_EQ(big.substr(0, c.staged) + big, content("f"));
        m_dir->remove_file(file);
    }
}

TEST_F(LogFileTest, UnbufferedWrites) {
    LogFile* file = make("f");
    const std::string data = pattern_bytes(1000, 5);
    faults::shorten(faults::WRITE, 300);
    EXPECT_EQ(1000, file->write_data(data.data(), data.size()));  // goes on after a short write
    EXPECT_EQ(2, faults::calls(faults::WRITE));
    EXPECT_EQ(1000, file->write_raw(data.data(), data.size()));
    faults::fail(faults::WRITE, 1, ENOSPC, 2);
    EXPECT_EQ(-1, file->write_data("x", 1));
    EXPECT_EQ(-2, file->write_raw("x", 1));
    faults::fail(faults::WRITE, 1, EIO);
    EXPECT_EQ(-1, file->write_raw("x", 1));
    faults::shorten(faults::WRITE, 0);
    EXPECT_EQ(-1, file->write_raw("x", 1));  // no endless loop
    EXPECT_EQ(data + data, content("f"));
    EXPECT_EQ(0u, file->size());
    file->set_size(2000);
    EXPECT_EQ(2000u, file->size());
    EXPECT_EQ(2000u, internal().size());
    // A failed flush drops what was staged; it stays counted.
    file->write("lost", 4);
    faults::fail(faults::WRITE, 1, ENOSPC);
    file->flush();
    file->flush();
    file->write("kept", 4);
    file->flush();
    EXPECT_EQ(data + data + "kept", content("f"));
    EXPECT_EQ(2008u, file->size());
}

TEST_F(LogFileTest, OpenAndClosed) {
    LogCapture log;
    const size_t before = open_descriptors();
    LogFile* file = make("f");
    EXPECT_EQ(0644u, mode_of(m_root.path(REL + std::string("f"))));
    EXPECT_EQ(FD_CLOEXEC, fcntl(file->fd(), F_GETFD));
    const int fd = file->fd();
    EXPECT_EQ(-1, file->open());
    EXPECT_EQ(fd, file->fd());
    EXPECT_EQ(before + 1, open_descriptors());
    file->write("0123456789", 10);
    file->close();
    EXPECT_EQ(-1, file->write("x", 1));
    EXPECT_EQ(-1, file->copy("/dev/null"));
    file->flush();
    EXPECT_EQ("", log.text());
    EXPECT_EQ(-1, file->write_data("x", 1));
    EXPECT_TRUE(
        log.has("ssize_t LogFile::write_data(const void*, size_t): write file not opened ["));
    // An existing file is written from its start and not cut.
    EXPECT_EQ(0, file->open());
    file->write("ab", 2);
    file->close();
    EXPECT_EQ("ab23456789", content("f"));
    EXPECT_EQ(before, open_descriptors());
    faults::fail(faults::OPEN, 1, ENOSPC);
    EXPECT_EQ(-1, file->open());
    EXPECT_EQ(-1, file->fd());
    EXPECT_EQ(0, file->open());
    // The destructor writes out what is staged.
    file->write("AB", 2);
    ObjectRef<LogFile> ref(file);
    m_mgr.get_media(MT_INTERNAL)->clear();
    EXPECT_FALSE(ref);
    EXPECT_EQ("AB23456789", content("f"));
    EXPECT_EQ(before, open_descriptors());
}

TEST_F(LogFileTest, Copy) {
    const std::string data = pattern_bytes(150000, 6);
    m_root.write_file("src", data);
    m_root.write_file("empty", "");
    const struct {
        const char* source;
        size_t cut;   // the first write is short
        int failing;  // number of the write that fails
        int result;
        size_t copied;
    } cases[] = {{"src", 0, 0, 0, 150000}, {"empty", 0, 0, 0, 0},    {"src", 100, 0, -1, 100},
                 {"src", 0, 1, -1, 0},     {"src", 0, 2, -1, 65536}, {"src", 0, 3, -1, 131072},
                 {"missing", 0, 0, -1, 0}, {"sd", 0, 0, -1, 0}};
    for (const auto& c : cases) {
        SCOPED_TRACE(std::string(c.source) + " " + std::to_string(c.failing));
        LogCapture log;
        LogFile* file = make("f");
        const size_t before = open_descriptors();
        if (c.cut > 0) {
            faults::shorten(faults::WRITE, c.cut);
        }
        faults::fail(faults::WRITE, c.failing > 0 ? c.failing : 1000, ENOSPC);
        const std::string source = m_root.path(c.source);
        EXPECT_EQ(c.result, file->copy(source.c_str()));
        EXPECT_EQ(c.source == std::string("missing"),
                  log.has("int LogFile::copy(const char*): open " + source + " error [2("));
        EXPECT_EQ(before, open_descriptors());
        EXPECT_EQ(c.copied, file->size());
        EXPECT_EQ(c.copied, internal().size());
        EXPECT_EQ(data.substr(0, c.copied), content("f"));
        m_dir->remove_file(file);
    }
}

TEST_F(LogFileTest, RotateAndRenumber) {
    const struct {
        const char* number;
        const char* rotated;  // null: refused
    } cases[] = {{"0", "1"},      {"9", "10"},   {"12", "13"},   {"007", "8"},
                 {"999", "1000"}, {"", nullptr}, {"x", nullptr}, {"42949672950", nullptr}};
    for (const auto& c : cases) {
        LogCapture log;
        const std::string name = c.number + STAMP;
        LogFile* file = make(name.c_str());
        file->write("x", 1);
        const std::string expected = (c.rotated ? c.rotated : c.number) + STAMP;
        EXPECT_EQ(c.rotated ? 0 : -1, file->rotate(m_dir->path()));
        EXPECT_EQ(expected, file->name().string());
        EXPECT_EQ(Names{expected}, m_root.list(REL));
        EXPECT_EQ(!c.rotated, log.has("int LogFile::rotate(const android::String8&): invalid log "
                                      "file name " +
                                      name + " ["));
        log.clear();
        EXPECT_EQ(c.rotated ? 0 : -1, file->change_name_num(77));
        EXPECT_EQ(Names{c.rotated ? "77" + STAMP : name}, m_root.list(REL));
        faults::fail(faults::RENAME, 1, EIO);
        EXPECT_EQ(c.rotated ? 0 : -1, file->change_name_num(77));
        EXPECT_EQ("", log.text());
        EXPECT_FALSE(faults::hit(faults::RENAME));
        faults::reset();
        file->close();
        EXPECT_EQ(1u, content(file->name().string()).size());
        m_dir->remove_file(file);
    }
    // A refused rename leaves the old name, in the object and on the medium.
    LogCapture log;
    LogFile* file = make(("5" + STAMP).c_str());
    faults::fail(faults::RENAME, 1, ENOSPC, 2);
    EXPECT_EQ(-1, file->rotate(m_dir->path()));
    EXPECT_EQ(-1, file->change_name_num(UINT32_MAX));
    EXPECT_TRUE(
        log.has("int LogFile::rotate(const android::String8&): rename 5" + STAMP + " failed [28("));
    EXPECT_TRUE(log.has("int LogFile::change_name_num(unsigned int): rename number in 5" + STAMP +
                        " failed [28("));
    EXPECT_EQ(Names{"5" + STAMP}, m_root.list(REL));
    EXPECT_EQ("5" + STAMP, file->name().string());
    // The number never wraps round to 0.
    EXPECT_EQ(0, file->change_name_num(UINT32_MAX));
    EXPECT_EQ(-1, file->rotate(m_dir->path()));
    EXPECT_EQ(Names{"4294967295" + STAMP}, m_root.list(REL));
}

TEST_F(LogFileTest, RemoveAndExists) {
    LogCapture log;
    LogFile* file = make("f");
    EXPECT_TRUE(file->exists());
    EXPECT_EQ(0, file->remove(m_dir->path()));
    EXPECT_FALSE(file->exists());
    EXPECT_EQ(0, file->remove(m_dir->path()));
    EXPECT_EQ("", log.text());
    m_root.make_dir(REL + std::string("f"));
    EXPECT_EQ(-1, file->remove(m_dir->path()));
    EXPECT_TRUE(log.has("int LogFile::remove(const android::String8&): delete " + m_root.path(REL) +
                        "f error ["));
    faults::fail(faults::ACCESS, 1, EACCES);
    EXPECT_FALSE(file->exists());
}

}  // namespace
