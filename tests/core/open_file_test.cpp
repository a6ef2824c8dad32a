#include "core/open_file.h"

#include <errno.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <string>

#include "support/TestRoot.h"

namespace {

// Where a regular file is expected anything may lie; a FIFO held the service for ever.
TEST(OpenFile, TakesOnlyWhatCanBeReadToAnEnd) {
    TestRoot root;
    root.write_file("file", "content");
    root.make_dir("dir");
    ASSERT_EQ(0, mkfifo(root.path("fifo").c_str(), 0600));
    ASSERT_EQ(0, symlink("file", root.path("link").c_str()));
    ASSERT_EQ(0, symlink("/dev/zero", root.path("device").c_str()));
    // Bound by a relative name: the root's path may be too long for a socket's address.
    const int cwd = open(".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    const int sock = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    struct sockaddr_un name = {AF_UNIX, "socket"};
    ASSERT_EQ(0, chdir(root.root().c_str()));
    ASSERT_EQ(0, bind(sock, reinterpret_cast<struct sockaddr*>(&name), sizeof(name)));
    ASSERT_EQ(0, fchdir(cwd));

    const struct {
        const char* name;
        Links links;
        int read_error;  // 0: it opens
        int write_error;
    } table[] = {
        {"file", Links::REFUSE, 0, 0},
        {"link", Links::FOLLOW, 0, 0},
        {"link", Links::REFUSE, ELOOP, ELOOP},
        {"missing", Links::FOLLOW, ENOENT, ENOENT},
        {"dir", Links::FOLLOW, EISDIR, EISDIR},
        {"fifo", Links::FOLLOW, EINVAL, ENXIO},
        {"device", Links::FOLLOW, EINVAL, EINVAL},
        {"socket", Links::FOLLOW, ENXIO, ENXIO},
    };
    const size_t descriptors = open_descriptors();
    for (const auto& row : table) {
        const std::string path = root.path(row.name);
        errno = 0;
        const int in = open_to_read(path.c_str(), row.links);
        EXPECT_EQ(row.read_error, in < 0 ? errno : 0) << row.name;
        const int out = open_to_write(path.c_str(), O_WRONLY, row.links);
        EXPECT_EQ(row.write_error, out < 0 ? errno : 0) << row.name;
        EXPECT_EQ(descriptors + (in >= 0) + (out >= 0), open_descriptors()) << row.name;
        if (in >= 0) {
            EXPECT_EQ(0, fcntl(in, F_GETFL) & O_NONBLOCK) << row.name;
            close(in);
            close(out);
        }
    }
    // With a reader the FIFO can be opened for writing, but it is still no file.
    const int reader = open(root.path("fifo").c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    EXPECT_EQ(-1, open_to_write(root.path("fifo").c_str(), O_WRONLY, Links::FOLLOW));
    EXPECT_EQ(EINVAL, errno);

    const mode_t mask = umask(0);
    const int made =
        open_to_write(root.path("made").c_str(), O_RDWR | O_CREAT | O_TRUNC, Links::REFUSE);
    umask(mask);
    struct stat st;
    ASSERT_EQ(0, fstat(made, &st));
    EXPECT_EQ(0644u, st.st_mode & 07777);
    for (int fd : {made, reader, sock, cwd}) {
        close(fd);
    }
}

}  // namespace
