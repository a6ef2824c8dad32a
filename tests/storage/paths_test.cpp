#include "storage/paths.h"

#include <gtest/gtest.h>
#include <limits.h>
#include <string.h>

#include <string>

#include "storage/StorageFixture.h"

namespace {

class PathsTest : public StorageTest {
protected:
    PathsTest() : m_cwd(open(".", O_RDONLY | O_DIRECTORY | O_CLOEXEC)) {
        EXPECT_EQ(0, chdir(m_root.root().c_str()));
        m_root.write_file("canary", "");
    }
    ~PathsTest() override {
        EXPECT_TRUE(m_root.exists("canary"));
        EXPECT_FALSE(m_root.exists("pwned"));
        EXPECT_EQ(0, fchdir(m_cwd));
        close(m_cwd);
    }

private:
    int m_cwd;
};

TEST_F(PathsTest, ShellReadsThePathBack) {
    EXPECT_STREQ("/data/modem_log/2016-03-01-09-15-00/cp_5mode",
                 shell_path("/data/modem_log/2016-03-01-09-15-00/cp_5mode").string());
    for (const std::string& name : strange_names()) {
        for (const std::string& path : {name, "/sd card/" + name, name + "/b"}) {
            const std::string expected = path[0] == '-' ? "./" + path : path;
            const std::string command =
                std::string("printf '%s' ") + shell_path(path.c_str()).string() + " > out";
            ASSERT_EQ(0, system(command.c_str())) << path;
            EXPECT_EQ(expected, m_root.read_file("out"));
        }
    }
}

// Removes the named directory, relative paths included, and nothing beside it.
TEST_F(PathsTest, RemoveTree) {
    for (const std::string& name : strange_names()) {
        for (const std::string& path : {name, "sd/" + name, m_root.path("sd/" + name)}) {
            SCOPED_TRACE(path);
            m_root.write_file("sd/neighbour/file", "");
            m_root.write_file("xneighbour/file", "");
            const std::string rel = path[0] == '/' ? "sd/" + name : path;
            m_root.write_file(rel + "/sub/file", "");
            EXPECT_EQ(0, remove_tree(path.c_str()));
            EXPECT_FALSE(m_root.exists(rel));
            EXPECT_TRUE(m_root.exists("sd/neighbour/file") && m_root.exists("xneighbour/file"));
        }
    }
    EXPECT_EQ(0, remove_tree(m_root.path("missing").c_str()));
}

TEST_F(PathsTest, RemoveNumberedEntries) {
    for (const std::string dir : {"plain", "a b'c", "-x;touch pwned"}) {
        m_root.write_file(dir + "/2016-03-01-09-15-00/cp/f", "");
        m_root.write_file(dir + "/9; touch pwned", "");
        m_root.write_file(dir + "/1'$(touch pwned)/-rf", "");
        m_root.write_file(dir + "/modem_db.gz", "");
        m_root.write_file(dir + "/-1", "");
        EXPECT_EQ(0, remove_numbered_entries(dir.c_str()));
        EXPECT_EQ((Names{"-1", "modem_db.gz"}), m_root.list(dir));
    }
    EXPECT_EQ(0, remove_numbered_entries("missing"));
}

TEST_F(PathsTest, MakeLogDir) {
    EXPECT_EQ(0, make_log_dir("made"));
    EXPECT_EQ(0775u, mode_of(m_root.path("made")));
    EXPECT_EQ(0, make_log_dir("made"));
    EXPECT_EQ(0, make_log_dir("canary"));  // something of that name exists
    EXPECT_EQ(-1, make_log_dir("canary/x"));
    EXPECT_EQ(-1, make_log_dir("no/parent"));
    EXPECT_TRUE(dir_usable("made"));
    EXPECT_FALSE(dir_usable("canary"));
    EXPECT_FALSE(dir_usable("missing"));
}

TEST(JoinedPath, Limit) {
    const android::String8 dir(std::string(PATH_MAX - 12, 'd').c_str());
    const std::string fits = std::string(dir.string()) + "/1234567890";
    EXPECT_STREQ(fits.c_str(), JoinedPath(dir, "1234567890").string());
    EXPECT_STREQ("", JoinedPath(dir, "12345678901").string());
    EXPECT_STREQ("/", JoinedPath("", "").string());
}

}  // namespace
