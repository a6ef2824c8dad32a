// SPDX-License-Identifier: Apache-2.0

#include "storage/StorageManager.h"

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
        EXPECT_EQ(self->m_mgr.media_type(), type);
        EXPECT_NE(self->m_mgr.get_media_stor()->working_set(), nullptr);
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
    } cases[] = {{MT_NONE, USABLE, MT_EXTERNAL, "E"},     {MT_NONE, BLOCKED, MT_INTERNAL, "I"},
                 {MT_NONE, ABSENT, MT_INTERNAL, "I"},     {MT_INTERNAL, USABLE, MT_EXTERNAL, "E"},
                 {MT_INTERNAL, BLOCKED, MT_INTERNAL, ""}, {MT_INTERNAL, ABSENT, MT_INTERNAL, ""},
                 {MT_EXTERNAL, USABLE, MT_EXTERNAL, ""},  {MT_EXTERNAL, ABSENT, MT_INTERNAL, "UI"}};
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
        ASSERT_EQ(m_mgr.media_type(), c.from);
        m_events.clear();
        if (c.card == BLOCKED) {
            m_root.write_file("sd/modem_log", "");
        }
        c.card == ABSENT ? pull_card() : plug_card();
        faults::set_time(++now);
        for (int i = 0; i < 2; ++i) {
            LogCapture log;
            EXPECT_EQ(m_mgr.check_media_change(), i == 0 && c.events[0]);
            EXPECT_EQ(m_mgr.media_type(), c.to);
            EXPECT_EQ(m_events, c.events);
            // An unusable card is tried again at each call.
            EXPECT_EQ(log.has("init SD card failed ["), c.card == BLOCKED);
        }
        EXPECT_EQ(external().scanned(), c.to == MT_EXTERNAL);
    }
}

typedef std::function<void()> Listener;

void call(void* listener) {
    (*static_cast<Listener*>(listener))();
}

TEST(SubscriberList, ChangesDuringARound) {
    SubscriberList<void (*)(void*)> list;
    std::string heard;
    Listener first = [&] { heard += "first "; };
    Listener sent_away = [&] { heard += "sent away "; };
    Listener newcomer = [&] { heard += "newcomer "; };
    Listener leaver = [&] {
        heard += "leaver ";
        list.remove(&leaver);
        list.remove(&sent_away);
        list.add(&newcomer, call);
    };
    for (Listener* listener : {&first, &leaver, &sent_away, &first}) {
        list.add(listener, call);
    }
    list.notify();
    list.remove(&first);  // one of its two places
    list.notify();
    EXPECT_EQ(heard, "first leaver first first newcomer ");
}

}  // namespace
