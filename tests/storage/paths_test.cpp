// SPDX-License-Identifier: Apache-2.0

#include "storage/paths.h"

#include <limits.h>
#include <sys/resource.h>

#include "storage/StorageFixture.h"

namespace {

// Names that a shell, an option parser or a terminal could take for something else. All
// would make a file "pwned" or remove "canary" in the working directory if executed.
Names strange_names() {
    const std::string all =
        "x; touch pwned|$(touch pwned)|`touch pwned`|a'b|a\"b|a'; touch pwned; "
        "'|-rf|--help|*|\\|a\\|"
        "line\ntouch pwned\n|? [a-z]* ~ {a,b}|&& rm -f canary|\xff\xfe\x80|#x|$HOME|~| |\t|!!|"
        "x;y|x&y|x>pwned|x<canary|x(y|x\ny|";
    Names names = {std::string(255, 'n'), std::string(255, '\''), "x|y"};
    for (size_t at = 0; at < all.size(); at = all.find('|', at) + 1) {
        names.push_back(all.substr(at, all.find('|', at) - at));
    }
    return names;
}

class PathsTest : public StorageTest {
protected:
    PathsTest() : m_cwd(open(".", O_RDONLY | O_DIRECTORY | O_CLOEXEC)) {
        EXPECT_EQ(chdir(m_root.root().c_str()), 0);
        m_root.write_file("canary", "");
    }
    ~PathsTest() override {
        EXPECT_TRUE(m_root.exists("canary"));
        EXPECT_FALSE(m_root.exists("pwned"));
        EXPECT_EQ(fchdir(m_cwd), 0);
        close(m_cwd);
    }

private:
    int m_cwd;
};

TEST_F(PathsTest, ShellReadsThePathBack) {
    EXPECT_STREQ(shell_path("/data/modem_log/2016-03/cp_5mode").string(),
                 "/data/modem_log/2016-03/cp_5mode");
    for (const std::string& name : strange_names()) {
        for (const std::string& path : {name, "/sd card/" + name, name + "/b"}) {
            const std::string expected = path[0] == '-' ? "./" + path : path;
            const std::string command =
                std::string("printf '%s' ") + shell_path(path.c_str()).string() + " > out";
            ASSERT_EQ(system(command.c_str()), 0) << path;
            EXPECT_EQ(m_root.read_file("out"), expected);
        }
    }
}

TEST_F(PathsTest, RemoveNumberedEntries) {
    for (const std::string dir : {"plain", "-x;touch pwned"}) {
        for (const char* name : {"/2016-03-01-09-15-00/cp/f", "/9; touch pwned",
                                 "/1'$(touch pwned)/-rf", "/modem_db.gz", "/-1"}) {
            m_root.write_file(dir + name, "");
        }
        EXPECT_EQ(remove_numbered_entries(dir.c_str()), 0);
        EXPECT_EQ(m_root.list(dir), (Names{"-1", "modem_db.gz"}));
    }
    EXPECT_EQ(remove_numbered_entries("missing"), 0);
}

// More than one command takes: rm was not even started, and everything stayed.
TEST_F(PathsTest, RemoveVeryManyNumberedEntries) {
    const std::string dir = "x; touch pwned/" + std::string(240, '\'');
    for (int i = 0; i < 1200; ++i) {  // 330 kB
        m_root.write_file(dir + "/" + std::to_string(i) + "; touch pwned", "");
    }
    m_root.write_file(dir + "/modem_db.gz", "");
    struct rlimit stack;
    ASSERT_EQ(getrlimit(RLIMIT_STACK, &stack), 0);
    const struct rlimit small = {1u << 20, stack.rlim_max};  // arguments get a quarter of it
    ASSERT_EQ(setrlimit(RLIMIT_STACK, &small), 0);
    EXPECT_EQ(remove_numbered_entries(dir.c_str()), 0);
    EXPECT_EQ(setrlimit(RLIMIT_STACK, &stack), 0);
    EXPECT_EQ(m_root.list(dir), Names{"modem_db.gz"});
    m_root.write_file(dir + "/1", "");
    faults::only_on("");
    faults::fail(faults::SYSTEM, 1, EAGAIN, faults::FOREVER);
    EXPECT_NE(remove_numbered_entries(dir.c_str()), 0);
}

TEST_F(PathsTest, DirectoriesAndLimit) {
    for (const char* dir : {"made", "made", "canary"}) {  // something of that name exists
        EXPECT_EQ(make_log_dir(dir), 0);
    }
    EXPECT_EQ(mode_of(m_root.path("made")), 0775u);
    EXPECT_EQ(make_log_dir("no/parent"), -1);
    EXPECT_EQ(remove_tree("missing"), 0);
    m_root.write_file("a'b; touch pwned/file", "");
    EXPECT_EQ(remove_tree("a'b; touch pwned"), 0);
    EXPECT_FALSE(m_root.exists("a'b; touch pwned"));
    EXPECT_TRUE(dir_usable("made") && !dir_usable("canary") && !dir_usable("missing"));
    const android::String8 dir(std::string(PATH_MAX - 12, 'd').c_str());
    EXPECT_EQ(strlen(JoinedPath(dir, "1234567890").string()), PATH_MAX - 1u);
    EXPECT_STREQ(JoinedPath(dir, "12345678901").string(), "");
}

}  // namespace
