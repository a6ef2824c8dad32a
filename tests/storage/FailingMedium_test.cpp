// SPDX-License-Identifier: Apache-2.0
// What is written while a medium fails: the logs of one channel, block by block, a second
// apart.
#include <errno.h>

#include "core/Multiplexer.h"
#include "storage/StorageFixture.h"
#include "storage/paths.h"

namespace {

class FailingMediumTest : public StorageTest {
protected:
    FailingMediumTest() {
        EXPECT_EQ(m_mgr.init(m_root.path("sd").c_str(), nullptr, &mux()), 0);
        m_store = m_mgr.create_storage(&m_channel);
    }
    static Multiplexer& mux() {
        static Multiplexer mux;  // outlives the manager
        return mux;
    }
    // How many of that many blocks are lost.
    int lost_of(int blocks, const std::string& block) {
        int lost = 0;
        for (int i = 0; i < blocks; ++i) {
            lost += write_later(block) != static_cast<int>(block.size());
        }
        return lost;
    }
};

// What the service itself runs short of is no fault of the card.
TEST_F(FailingMediumTest, WantOfDescriptorsKeepsTheCard) {
    plug_card();
    faults::fail(faults::OPEN, 1, EMFILE, 2);
    EXPECT_EQ(lost_of(5, "x"), 2);
    faults::set_time(-1);
    m_store->stop();
    EXPECT_EQ(m_store->write("x", 1), -1);
    EXPECT_EQ(m_mgr.media_type(), MT_EXTERNAL);
}

// It seems to work each time it is tried.
TEST_F(FailingMediumTest, ACardThatKeepsFailingRestsEachTimeLonger) {
    boot_clock::freeze();
    plug_card();
    faults::only_on("/sd/modem_log/2");
    faults::fail(faults::OPEN, 1, EIO, faults::FOREVER);
    EXPECT_EQ(lost_of(20, "x"), 2);
    for (const unsigned int s : {3u, 6u, 12u, 24u, 48u, 96u, 192u, 384u, 600u, 600u}) {
        boot_clock::advance(s * 1000 - 1);
        mux().timer_mgr().process_timers();
        EXPECT_EQ(lost_of(2, "x"), 0) << s;
        boot_clock::advance(1);
        mux().timer_mgr().process_timers();
        EXPECT_EQ(lost_of(2, "x"), 1) << s;
    }
    boot_clock::real();
}

// Writes to the card fail while that is so.
const bool ALWAYS = true;
void fail_on_card(int error, const bool& failing = ALWAYS) {
    faults::instead.write = [error, &failing](int fd, const void* data, size_t len) {
        const bool fails = failing && faults::path_of(fd).find("/sd/") != std::string::npos;
        return fails ? (errno = error, ssize_t{-1}) : real::write(fd, data, len);
    };
}

// Each block was staged and then lost by a flush, which nobody asked how it went: nothing was
// logged any more, and nothing told it.
TEST_F(FailingMediumTest, ACardToWhichBlocksAreOnlyStagedIsLeft) {
    for (const bool asked : {false, true}) {
        plug_card();
        m_mgr.set_sd_size(asked ? 1000000 : 50000);
        EXPECT_EQ(lost_of(1, std::string(20000, 'x')), 0);
        EXPECT_EQ(m_mgr.media_type(), MT_EXTERNAL);
        fail_on_card(EIO);
        LogCapture log;
        for (int i = 0; i < 5; ++i) {
            EXPECT_EQ(lost_of(1, std::string(20000, 'x')), 0);
            if (asked) {
                m_store->flush();
            }
        }
        EXPECT_EQ(m_mgr.media_type(), MT_INTERNAL) << asked;
        EXPECT_EQ(log.count("what cp_gnss had staged is lost ["), 1u) << log.text();
        EXPECT_GE(internal().size(), 40000u);
        faults::instead = {};
        pull_card();
        lost_of(1, "x");
    }
}

// What a flush lost on a full card makes room there with the next write, if it is still full then.
TEST_F(FailingMediumTest, RoomIsMadeOnAMediumThatIsStillFull) {
    const std::string old = "modem_log/2016-02-01-00-00-00/cp_gnss/old";
    m_root.write_file("data/" + old, "12345678");
    m_root.write_file("sd/" + old, "12345678");
    rescan();
    m_mgr.set_file_size(16);
    for (const std::string now : {"with room", "pulled", "full"}) {
        plug_card();
        EXPECT_EQ(lost_of(1, "x"), 0);
        EXPECT_EQ(m_mgr.media_type(), MT_EXTERNAL);
        bool full = true;
        fail_on_card(ENOSPC, full);
        m_store->flush();
        EXPECT_TRUE(m_root.exists("sd/" + old)) << "not by the flush";
        full = now == "full";
        if (now == "pulled") {
            pull_card();
        }
        EXPECT_EQ(lost_of(1, "x"), now == "full" ? 1 : 0);
        EXPECT_EQ(m_root.exists("sd/" + old), now != "full") << now;
        EXPECT_TRUE(m_root.exists("data/" + old)) << now;
        faults::instead = {};
    }
}

// A card that failed once, and on which then a directory has the name of the file that is to
// show that it works again, or which is full.
TEST_F(FailingMediumTest, ACardThatFailedOnceIsUsedAgain) {
    plug_card();
    m_root.write_file("sd/modem_log/.write_test/x", "");
    const std::string block(70000, 'x');
    faults::fail(faults::WRITE, 1, EIO);
    EXPECT_EQ(lost_of(2, block), 1);
    EXPECT_EQ(m_mgr.media_type(), MT_EXTERNAL);
    pull_card();
    m_root.write_file("sd/modem_log/2016-02-01-00-00-00/cp_gnss/old", block);
    m_mgr.set_file_size(70000);
    EXPECT_EQ(lost_of(1, block), 0);
    plug_card();
    faults::fail(faults::WRITE, 1, EIO);
    EXPECT_EQ(lost_of(1, block), 1);
    bool full = true;
    fail_on_card(ENOSPC, full);
    faults::instead.unlink = [&](const char* path) {
        full = full && !strstr(path, "/old");
        return real::unlink(path);
    };
    EXPECT_EQ(lost_of(2, block), 1);
    EXPECT_EQ(m_mgr.media_type(), MT_EXTERNAL);
    faults::instead = {};
}

TEST_F(FailingMediumTest, WhatCannotBeMadeOnAMedium) {
    const std::string old = "data/modem_log/2016-02-0", file = "-00-00-00/cp_gnss/old";
    for (const char* number : {"1", "2", "3"}) {
        m_root.write_file(old + number + file, "0123456789abcdef");
    }
    rescan();
    m_mgr.set_file_size(16);
    faults::fail(faults::MKDIR, 1, ENOSPC);  // a set
    EXPECT_EQ(lost_of(1, "x"), 0);
    EXPECT_FALSE(m_root.exists(old + "1" + file)) << "no room was made";
    faults::only_on("dump");
    faults::fail(faults::OPEN, 1, ENOSPC, 2);  // a file that is not a log
    EXPECT_EQ(m_store->create_file("dump", LT_DUMP), nullptr);
    EXPECT_FALSE(m_root.exists(old + "2" + file)) << "no room was made";
    EXPECT_TRUE(m_root.exists(old + "3" + file)) << "room is made once";
    NamedChannel channel("cp_wcn");
    CpStorage* const other = m_mgr.create_storage(&channel);
    EXPECT_EQ(other->write("x", 1), 1);
    plug_card();
    EXPECT_EQ(lost_of(1, "x"), 0);
    EXPECT_EQ(other->write("x", 1), 1);
    EXPECT_TRUE(other->on_sd(other->current_file())) << "all logs go to the card";
    m_store->stop();
    faults::only_on("sd/modem_log/2016");
    faults::fail(faults::OPEN, 1, EIO, faults::FOREVER);  // a log file
    EXPECT_EQ(lost_of(3, "x"), 2);
    EXPECT_EQ(m_mgr.media_type(), MT_INTERNAL);
    int told = 0;
    m_mgr.subscribe_ext_stor_umount_evt(&told, [](void* n) { ++*static_cast<int*>(n); });
    pull_card();
    EXPECT_EQ(lost_of(1, "x"), 0);
    EXPECT_EQ(told, 1) << "a dump may lie on it";
    plug_card();
    const LogFile* const saved = m_store->create_file("dump", LT_DUMP);
    EXPECT_TRUE(saved && !m_store->on_sd(saved)) << "the third try is inside";
    m_mgr.unsubscribe_ext_stor_umount_evt(&told);
    m_mgr.delete_storage(other);
}

// A broken medium may say of every name that it is taken.
TEST_F(FailingMediumTest, NamesAreNotTriedForEver) {
    faults::fail(faults::OPEN, 1, EEXIST, faults::FOREVER);
    EXPECT_EQ(lost_of(1, "x"), 1);
    faults::reset();
    EXPECT_EQ(lost_of(1, "x"), 0);
    m_root.write_file("some file", "");
    faults::instead.lstat = [&](const char* path, struct stat* st) {
        return strstr(path, ".log") ? real::lstat(m_root.path("some file").c_str(), st)
                                    : real::lstat(path, st);
    };
    EXPECT_EQ(lost_of(1, "x"), 0);
    m_store->stop();
    EXPECT_EQ(lost_of(1, "x"), 0) << "what cannot be renamed stays where it is";
    faults::instead = {};
    m_store->stop();
    EXPECT_EQ(lost_of(1, "x"), 0);
    EXPECT_EQ(m_root.find("0-cp_").size(), 1u);
}

// Only files that trimming spares are left on a full medium.
TEST_F(FailingMediumTest, FullMediumOfSparedFiles) {
    const std::string block(70000, 'x');
    m_mgr.set_file_size(100000);
    EXPECT_EQ(lost_of(1, block), 0);
    m_root.write_file("data/modem_log/2016-03-01-09-15-01/stranger", "");  // goes by the shell
    faults::fail(faults::WRITE, 1, ENOSPC);
    faults::fail(faults::MKDIR, 1, ENOSPC);  // nor is there room for a directory
    EXPECT_EQ(lost_of(1, block), 1);
    EXPECT_EQ(errno, ENOSPC);                 // not what making room came across
    EXPECT_EQ(internal().sets().size(), 1u);  // the old one is trimmed, nothing else was there
    EXPECT_EQ(internal().size(), 0u);
    EXPECT_EQ(lost_of(3, block), 0);
}

// A medium so full that it takes no file, or no directory: what made no room before.
TEST_F(FailingMediumTest, RoomIsMadeForFilesAndSets) {
    const std::string block(70000, 'x');
    const char* refused = "-cp_gnss-";
    bool full = false;
    const auto refuses = [&](const char* path) {
        const bool yes = full && strstr(path, refused);
        errno = yes ? ENOSPC : errno;
        return yes;
    };
    faults::instead.open = [&](const char* path, int flags, mode_t mode) {
        return (flags & O_CREAT) && refuses(path) ? -1 : real::open(path, flags, mode);
    };
    faults::instead.mkdir = [&](const char* path, mode_t mode) {
        return refuses(path) ? -1 : real::mkdir(path, mode);
    };
    faults::instead.unlink = [&](const char* path) {
        full = full && strstr(path, ".write_test");
        const int result = real::unlink(path);
        errno = EPERM;
        return result;
    };
    m_mgr.set_file_size(100000);
    EXPECT_EQ(lost_of(1, block), 0);
    m_store->stop();
    full = true;  // no log file, and only a spared one is there
    EXPECT_EQ(lost_of(1, block), 1);
    EXPECT_EQ(errno, ENOSPC);
    EXPECT_EQ(lost_of(5, block), 0);
    m_mgr.set_file_size(1000000);
    refused = "dump";  // with a little room to make
    full = true;
    EXPECT_NE(m_store->create_file("dump", LT_DUMP), nullptr);
    m_mgr.set_file_size(0);
    EXPECT_EQ(internal().free_space(), -1) << "nothing is left to delete";

    m_root.write_file("sd/modem_log/2016-02-01-00-00-00/cp_gnss/old", block);
    plug_card();
    EXPECT_EQ(lost_of(1, block), 0);
    const std::string log_root = m_root.path("sd/modem_log"), away = m_root.path("away");
    ASSERT_EQ(rename(log_root.c_str(), away.c_str()), 0);
    refused = "sd/modem_log/2";  // the card is away for a moment and then full of old logs
    faults::fail(faults::MKDIR, 1, EIO);
    EXPECT_EQ(lost_of(1, block), 1);
    ASSERT_EQ(rename(away.c_str(), log_root.c_str()), 0);
    full = true;
    EXPECT_EQ(lost_of(1, block), 0);
    EXPECT_EQ(m_mgr.media_type(), MT_EXTERNAL);
    EXPECT_FALSE(m_root.exists("sd/modem_log/2016-02-01-00-00-00"));
    refused = "data/modem_log/2";  // the card fails, and spared files fill the internal medium
    full = true;
    fail_on_card(EIO);
    EXPECT_EQ(lost_of(3, block), 1);
    EXPECT_EQ(m_mgr.media_type(), MT_INTERNAL);
    faults::instead = {};
    check_sums(internal());
}

// Nothing is written to a card above its quota that could tell that it fails.
TEST_F(FailingMediumTest, ACardThatTakesNoSetIsLeft) {
    plug_card();
    m_mgr.set_sd_size(30000);
    EXPECT_EQ(lost_of(2, std::string(20000, 'x')), 0);
    faults::fail(faults::MKDIR, 1, EIO);
    fail_on_card(EIO);
    EXPECT_EQ(lost_of(3, "x"), 1);
    EXPECT_EQ(m_mgr.media_type(), MT_INTERNAL);
    faults::instead = {};
}

// A full medium on which no directory can be made, whatever room is made there.
TEST_F(FailingMediumTest, ASetThatCannotBeMadeCostsLittle) {
    const std::string block(70000, 'x');
    const char* refused = "data/modem_log/2";
    m_mgr.set_file_size(100000);
    EXPECT_EQ(lost_of(3, block), 0);  // two files, both spared
    plug_card();
    EXPECT_EQ(lost_of(1, block), 0);
    faults::instead.mkdir = [&](const char* path, mode_t mode) {
        return strstr(path, refused) ? (errno = ENOSPC, -1) : real::mkdir(path, mode);
    };
    pull_card();
    EXPECT_EQ(lost_of(2, block), 0) << "the old set is there";
    refused = "sd/modem_log/2";
    for (const char* day : {"1", "2", "3", "4", "5"}) {
        m_root.write_file("sd/modem_log/2016-02-0" + std::string(day) + "-00-00-00/cp_wcn/old",
                          block);
    }
    plug_card();
    EXPECT_EQ(lost_of(4, block), 0);
    EXPECT_EQ(m_root.list("sd/modem_log").size(), 4u) << "of six: room was made once";
}

// One file that cannot be deleted kept everything behind it, and so the medium full for good.
TEST_F(FailingMediumTest, WhatCannotBeDeletedIsPassedOver) {
    const std::string old = "data/modem_log/2016-02-0", block(16, 'x');
    for (const char* file : {"1-00-00-00/cp_gnss/a", "1-00-00-00/cp_gnss/b", "1-00-00-00/cp_gnss/c",
                             "2-00-00-00/cp_gnss/d"}) {
        m_root.write_file(old + file, block);
    }
    rescan();
    bool stuck = true;
    faults::instead.unlink = [&](const char* path) {
        return stuck && strrchr(path, '/')[1] == 'c' ? (errno = EIO, -1) : real::unlink(path);
    };
    // Of unknown files the last one found is first: the order of a, b and c is not fixed.
    EXPECT_EQ(internal().trim(48), 48u);
    EXPECT_EQ(m_root.list(old + "1-00-00-00/cp_gnss"), Names{"c"});
    EXPECT_FALSE(m_root.exists(old + "2-00-00-00"));
    EXPECT_EQ(lost_of(1, block), 0);
    for (const char* name : {"c1", "e", "f"}) {  // in the set in use, after the older one
        m_store->create_file(name, LT_DUMP)->write(block.data(), block.size());
    }
    EXPECT_EQ(internal().trim(16), 16u);
    EXPECT_EQ(m_root.find("cp_gnss/e").size() + m_root.find("cp_gnss/f").size(), 1u);
    stuck = false;
    EXPECT_EQ(internal().trim(16), 16u);
    EXPECT_FALSE(m_root.exists(old + "1-00-00-00")) << "it is tried again";
    check_sums(internal());

    // On a dying medium each try may last.
    for (int i = 0; i < 200; ++i) {
        m_root.write_file(old + "1-00-00-00/cp_gnss/" + std::to_string(i), block);
    }
    rescan();
    faults::instead = {};
    faults::only_on("/cp_gnss/");
    faults::fail(faults::UNLINK, 1, EIO, faults::FOREVER);
    const int before = faults::calls(faults::UNLINK);
    EXPECT_EQ(internal().trim(16), 0u);
    EXPECT_LE(faults::calls(faults::UNLINK) - before, 20);
}

// Each block that was refused tried them all again, with two messages each.
TEST_F(FailingMediumTest, ManyThatCannotBeDeletedAreTriedNowAndThen) {
    const std::string block(70000, 'x');
    for (int day = 10; day < 40; ++day) {
        m_root.write_file("data/modem_log/2016-02-" + std::to_string(day) + "/cp_gnss/old", block);
    }
    rescan();
    EXPECT_EQ(lost_of(1, block), 0);
    m_mgr.set_file_size(2000000);
    for (const bool full : {false, true}) {
        bool stuck = true;
        int tries = 0;
        faults::instead.unlink = [&](const char* path) {
            ++tries;
            return stuck ? (errno = EPERM, -1) : real::unlink(path);
        };
        faults::instead.write = [&](int fd, const void* data, size_t len) {
            return full && stuck ? (errno = ENOSPC, ssize_t{-1}) : real::write(fd, data, len);
        };
        internal().set_quota(full ? 0 : internal().size() - 100);
        lost_of(60, block);
        EXPECT_GE(tries, 60);  // of 30 files
        EXPECT_LE(tries, 250);
        stuck = false;
        EXPECT_LE(lost_of(40, block), 31);
        EXPECT_EQ(internal().check_quota(), 0);
        faults::instead = {};
    }
}

// Nothing is written to such a card, full or above its quota, that could tell that it fails.
TEST_F(FailingMediumTest, ACardOnWhichNothingCanBeDeletedIsLeft) {
    const std::string block(70000, 'x');
    m_mgr.set_file_size(100000);
    for (const bool full : {false, true}) {
        for (const int error : {EIO, EROFS, EPERM}) {
            SCOPED_TRACE(std::string(full ? "full " : "quota ") + strerror(error));
            m_root.write_file("sd/modem_log/2016-02-01-00-00-00/cp_gnss/old", block);
            m_mgr.set_sd_size(full ? 0 : 80000);
            plug_card();
            faults::instead.unlink = [&](const char* path) {
                return strstr(path, "/sd/") ? (errno = error, -1) : real::unlink(path);
            };
            fail_on_card(ENOSPC, full);
            const uint64_t inside = internal().size();
            const bool left = error != EPERM;  // that tells nothing of the card
            EXPECT_EQ(lost_of(6, block), left ? 1 : full ? 6 : 5);
            EXPECT_EQ(m_mgr.media_type(), left ? MT_INTERNAL : MT_EXTERNAL);
            EXPECT_EQ(internal().size() > inside, left);
            faults::instead = {};
            m_mgr.set_sd_size(0);
            pull_card();
            lost_of(1, block);
            remove_tree(m_root.path("sd/modem_log").c_str());
        }
    }
}

// Somebody put directories in the place of log files.
TEST_F(FailingMediumTest, ADirectoryIsNoLogFile) {
    const std::string old = "data/modem_log/2016-02-01-00-00-00/cp_gnss/", block(70000, 'x');
    const auto replace = [&](const std::string& file) {
        ASSERT_EQ(unlink(m_root.path(file).c_str()), 0) << file;
        m_root.make_dir(file);
    };
    m_root.write_file(old + "0-cp_gnss-2016-02-01_00-00-00.log", block);
    rescan();
    replace(old + "0-cp_gnss-2016-02-01_00-00-00.log");
    EXPECT_EQ(lost_of(2, block), 0);
    internal().set_quota(150000);
    EXPECT_EQ(internal().check_quota(), 0) << "counted again";
    EXPECT_EQ(internal().size(), 140000u);
    m_store->stop();
    const std::string current = m_root.find("/0-cp_gnss").back();
    replace(current);
    EXPECT_EQ(lost_of(1, block), 0);
    EXPECT_TRUE(m_root.exists(current)) << "it is not renamed";
    internal().set_quota(1000000);
    m_store->stop();
    EXPECT_EQ(lost_of(1, block), 0);
    internal().check_quota();
    check_sums(internal());
}

// What a scan could not read was not known, and went with the directory that seemed empty.
TEST_F(FailingMediumTest, WhatAScanLeftOutIsNotDeleted) {
    const struct {
        faults::Call call;
        int nth, times;
        uint64_t left;  // in two files of 16 bytes, of which one was to go
    } CASES[] = {
        {faults::FSTATAT, 2, 1, 16},  // the directory
        {faults::FSTATAT, 3, 1, 16},  // a file
        {faults::FSTATAT, 3, faults::FOREVER, 32},
        {faults::OPENDIR, 3, 1, 16},
        {faults::OPENDIR, 3, faults::FOREVER, 32},
    };
    const std::string dir = "data/modem_log/2016-02-01-00-00-00/cp_gnss";
    for (const auto& c : CASES) {
        SCOPED_TRACE(std::to_string(c.call) + " " + std::to_string(c.nth));
        m_root.write_file(dir + "/a", "0123456789abcdef");
        m_root.write_file(dir + "/b", "0123456789abcdef");
        internal().clear();
        faults::reset();
        faults::only_on("");
        faults::fail(c.call, c.nth, EIO, c.times);
        ASSERT_EQ(internal().stat(), 0);
        internal().trim(16);
        check_sums(internal());
        EXPECT_TRUE(faults::hit(c.call));
        faults::reset();
        EXPECT_EQ(m_root.list(dir).size() * 16, c.left);
        for (int i = 0; i < 16; ++i) {
            internal().trim(32);
        }
        EXPECT_FALSE(m_root.exists(dir));
    }
}

// A number beyond 32 bits cannot be raised; an errno from before made that look like a file
// that is gone, and it was deleted.
TEST_F(FailingMediumTest, NumberTooLargeIsNoReasonToDelete) {
    const std::string name = "42949672950-cp_gnss-2016-03-01_00-00-00.log";
    const std::string dir = "data/modem_log/2016-03-01-09-15-01/cp_gnss/";
    m_root.write_file(dir + name, "12345");
    EXPECT_EQ(lost_of(1, "x"), 0);
    m_store->stop();
    errno = ENOENT;
    EXPECT_EQ(lost_of(1, "x"), 0);
    EXPECT_EQ(m_root.read_file(dir + name), "12345");
}

}  // namespace
