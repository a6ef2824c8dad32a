// SPDX-License-Identifier: Apache-2.0

#include "core/open_file.h"

#include <errno.h>
#include <fcntl.h>
#include <sys/stat.h>

#include "support/TestRoot.h"
#include "support/faults.h"

namespace {

// Where a regular file is expected anything may lie; a FIFO held the service for ever.
TEST(OpenFile, TakesOnlyWhatCanBeReadToAnEnd) {
    TestRoot root;
    root.write_file("file", "content");
    root.make_dir("dir");
    ASSERT_EQ(mkfifo(root.path("fifo").c_str(), 0600), 0);
    root.write_file("twice", "content");
    ASSERT_EQ(link(root.path("twice").c_str(), root.path("hard").c_str()), 0);
    ASSERT_EQ(symlink("file", root.path("link").c_str()), 0);
    ASSERT_EQ(symlink("/dev/zero", root.path("device").c_str()), 0);
    const struct {
        const char* name;
        Links links;
        int read_error;  // 0: it opens
        int write_error;
    } table[] = {
        {"file", Links::REFUSE, 0, 0},          {"link", Links::FOLLOW, 0, 0},
        {"link", Links::REFUSE, ELOOP, ELOOP},  {"dir", Links::FOLLOW, EISDIR, EISDIR},
        {"fifo", Links::FOLLOW, EINVAL, ENXIO}, {"device", Links::FOLLOW, EINVAL, EINVAL},
        {"hard", Links::REFUSE, 0, EMLINK},     {"hard", Links::FOLLOW, 0, 0},
    };
    const size_t descriptors = open_descriptors();
    for (const auto& row : table) {
        const std::string path = root.path(row.name);
        errno = 0;
        const int in = open_to_read(path.c_str(), row.links);
        EXPECT_EQ(in < 0 ? errno : 0, row.read_error) << row.name;
        const int out = open_to_write(path.c_str(), O_WRONLY, row.links);
        EXPECT_EQ(out < 0 ? errno : 0, row.write_error) << row.name;
        EXPECT_EQ(open_descriptors(), descriptors + (in >= 0) + (out >= 0)) << row.name;
        if (in >= 0) {
            EXPECT_EQ(fcntl(in, F_GETFL) & O_NONBLOCK, 0) << row.name;
            close(in);
        }
        if (out >= 0) {
            close(out);
        }
    }
    // Raw flash is a character device that has a size.
    faults::instead.fstat = [](int fd, struct stat* st) {
        const int result = real::fstat(fd, st);
        st->st_mode = (st->st_mode & 07777) | S_IFCHR;
        return result;
    };
    const int flash = open_to_read(root.path("file").c_str(), Links::REFUSE);
    EXPECT_EQ(lseek(flash, 0, SEEK_CUR), 0);
    EXPECT_EQ(open_to_write(root.path("file").c_str(), O_WRONLY, Links::REFUSE), -1);
    faults::instead = {};
    close(flash);
    EXPECT_EQ(open_to_write(root.path("hard").c_str(), O_WRONLY | O_TRUNC, Links::REFUSE), -1);
    EXPECT_EQ(root.read_file("twice"), "content") << "not cut before it was refused";
    const mode_t mask = umask(0);
    const int made =
        open_to_write(root.path("made").c_str(), O_RDWR | O_CREAT | O_TRUNC, Links::REFUSE);
    umask(mask);
    struct stat st;
    ASSERT_EQ(fstat(made, &st), 0);
    EXPECT_EQ(st.st_mode & 07777, 0644u);
    close(made);
}

}  // namespace
