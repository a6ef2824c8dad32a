#include "storage/StorageManager.h"

#include <errno.h>

#include "storage/StorageFixture.h"
#include "storage/SubscriberList.h"
#include "storage/paths.h"

namespace {

class StorageManagerTest : public StorageTest {
protected:
    void SetUp() override {
        init();
        m_mgr.subscribe_media_change_evt(this, on_change);
        m_mgr.subscribe_ext_stor_umount_evt(this, on_umount);
    }
    static void on_change(void* client, MediaType type) {
        StorageManagerTest* self = static_cast<StorageManagerTest*>(client);
        EXPECT_EQ(type, self->m_mgr.media_type());
        EXPECT_NE(nullptr, self->m_mgr.get_media_stor()->working_set());
        self->m_events += type == MT_INTERNAL ? "I" : "E";
    }
    static void on_umount(void* client) {
        StorageManagerTest* self = static_cast<StorageManagerTest*>(client);
        EXPECT_FALSE(self->external().sets().empty());  // still there
        self->m_events += "U";
    }

    std::string m_events;
};

enum CardState { USABLE, BLOCKED, ABSENT };

// Every state of the medium in use against every state of the card.
TEST_F(StorageManagerTest, Transitions) {
    const struct {
        MediaType from;
        CardState card;
        MediaType to;
        const char* events;
        size_t lines;  // logged
    } cases[] = {
        {MT_NONE, USABLE, MT_EXTERNAL, "E", 1},     {MT_NONE, BLOCKED, MT_INTERNAL, "I", 2},
        {MT_NONE, ABSENT, MT_INTERNAL, "I", 0},     {MT_INTERNAL, USABLE, MT_EXTERNAL, "E", 1},
        {MT_INTERNAL, BLOCKED, MT_INTERNAL, "", 2}, {MT_INTERNAL, ABSENT, MT_INTERNAL, "", 0},
        {MT_EXTERNAL, USABLE, MT_EXTERNAL, "", 0},  {MT_EXTERNAL, ABSENT, MT_INTERNAL, "UI", 1}};
    time_t now = NOW;
    for (const auto& c : cases) {
        SCOPED_TRACE(std::to_string(c.from) + " " + std::to_string(c.card));
        // Into the state to start from, through its unmounted state.
        remove_tree(m_root.path("sd/modem_log").c_str());
        pull_card();
        m_mgr.check_media_change();
        m_mgr.clear_all();
        if (c.from == MT_EXTERNAL) {
            plug_card();
        }
        if (c.from != MT_NONE) {
            EXPECT_TRUE(m_mgr.check_media_change());
        }
        ASSERT_EQ(c.from, m_mgr.media_type());
        m_events.clear();
        if (c.card == BLOCKED) {
            m_root.write_file("sd/modem_log", "");
        }
        c.card == ABSENT ? pull_card() : plug_card();
        faults::set_time(++now);
        for (int i = 0; i < 2; ++i) {
            LogCapture log;
            EXPECT_EQ(i == 0 && c.events[0], m_mgr.check_media_change());
            EXPECT_EQ(c.to, m_mgr.media_type());
            EXPECT_EQ(c.events, m_events);
            // An unusable card is tried again at each call.
            EXPECT_EQ(i == 0 || c.card == BLOCKED ? c.lines : 0, log.count("\n"));
            EXPECT_EQ(c.card == BLOCKED, log.has("init SD card failed ["));
        }
        EXPECT_EQ(c.to == MT_EXTERNAL, external().scanned());
    }
}

// A dump may still lie on a card that is not in use any more.
TEST_F(StorageManagerTest, PullingACardThatWasInUseIsTold) {
    plug_card();
    m_mgr.check_media_change();
    EXPECT_TRUE(m_mgr.creation_failed(&external(), EROFS));
    faults::only_on("/sd/");
    faults::fail(faults::OPEN, 1, EROFS, 100);
    m_mgr.check_media_change();
    ASSERT_EQ(MT_INTERNAL, m_mgr.media_type());
    pull_card();
    EXPECT_FALSE(m_mgr.check_media_change());
    EXPECT_FALSE(m_mgr.check_media_change());
    EXPECT_EQ("EIU", m_events);
}

TEST_F(StorageManagerTest, CardStateAndClearAll) {
    for (const char* value : {"", "stopped", "Running", "running "}) {
        m_root.set_prop("init.svc.fuse_sdcard0", value);
        EXPECT_FALSE(m_mgr.is_sd_mounted()) << value;
    }
    plug_card();
    m_root.write_file("sd/modem_log/2016-02-01-00-00-00/cp/f", "1");
    m_root.write_file("data/modem_log/sha1.txt", "1");
    EXPECT_TRUE(m_mgr.check_media_change());
    m_mgr.clear_all();
    EXPECT_EQ(Names{}, m_root.list("sd/modem_log"));
    EXPECT_EQ(Names{"sha1.txt"}, m_root.list("data/modem_log"));
    EXPECT_EQ(MT_NONE, m_mgr.media_type());
    EXPECT_TRUE(m_mgr.check_media_change());
    EXPECT_EQ("EE", m_events);
}

// Subscribers that leave, make another one leave or a third one join while called.
SubscriberList<void (*)(void*, int)> s_list;
std::string s_heard;
char s_names[] = "abcd";

void hear(void* client, int) {
    s_heard += *static_cast<char*>(client);
    if (client == &s_names[1]) {
        s_list.remove(&s_names[1]);
        s_list.remove(&s_names[2]);
        s_list.add(&s_names[3], hear);
    }
}

TEST(SubscriberList, ChangesDuringARound) {
    for (int i : {0, 1, 2, 0}) {
        s_list.add(&s_names[i], hear);
    }
    s_list.notify(1);
    EXPECT_EQ("aba", s_heard);
    s_list.remove(&s_names[0]);  // the first one only
    s_list.notify(1);
    EXPECT_EQ("abaad", s_heard);
}

}  // namespace
