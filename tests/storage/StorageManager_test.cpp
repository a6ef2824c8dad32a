#include "storage/StorageManager.h"

#include <errno.h>

#include "storage/StorageFixture.h"
#include "storage/SubscriberList.h"
#include "storage/paths.h"

namespace {

class StorageManagerTest : public StorageTest {
protected:
    void subscribe() {
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
        EXPECT_EQ(MT_EXTERNAL, self->m_mgr.media_type());
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
        bool changed;
        MediaType to;
        const char* events;
        const char* messages[2];
    } cases[] = {
        {MT_NONE, USABLE, true, MT_EXTERNAL, "E", {"Storage changing to external SD\n", nullptr}},
        {MT_NONE,
         BLOCKED,
         true,
         MT_INTERNAL,
         "I",
         {"Storage changing to external SD\n", "init SD card failed ["}},
        {MT_NONE, ABSENT, true, MT_INTERNAL, "I", {nullptr, nullptr}},
        {MT_INTERNAL,
         USABLE,
         true,
         MT_EXTERNAL,
         "E",
         {"Storage changing to external SD\n", nullptr}},
        {MT_INTERNAL,
         BLOCKED,
         false,
         MT_INTERNAL,
         "",
         {"Storage changing to external SD\n", "init SD card failed ["}},
        {MT_INTERNAL, ABSENT, false, MT_INTERNAL, "", {nullptr, nullptr}},
        {MT_EXTERNAL, USABLE, false, MT_EXTERNAL, "", {nullptr, nullptr}},
        {MT_EXTERNAL, ABSENT, true, MT_INTERNAL, "UI", {"sd card is umounted!\n", nullptr}},
    };
    init();
    subscribe();
    time_t now = NOW;
    for (const auto& c : cases) {
        SCOPED_TRACE(std::to_string(c.from) + " " + std::to_string(c.card));
        // Into the state to start from, through its unmounted state.
        remove_tree(m_root.path("sd/modem_log").c_str());
        pull_card();
        m_mgr.check_media_change();
        external().clear();
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
        for (int i = 0; i < 3; ++i) {
            LogCapture log;
            EXPECT_EQ(i == 0 && c.changed, m_mgr.check_media_change());
            EXPECT_EQ(c.to, m_mgr.media_type());
            EXPECT_EQ(c.events, m_events);
            // An unusable card is tried again at each call.
            size_t expected = 0;
            for (const char* message : c.messages) {
                if (message && (i == 0 || c.card == BLOCKED)) {
                    ++expected;
                    EXPECT_TRUE(log.has("bool StorageManager::check_media_change(): " +
                                        std::string(message)));
                }
            }
            EXPECT_EQ(expected, log.count("\n"));
        }
        if (c.changed) {
            EXPECT_EQ(Names{"2016-03-01-09-15-" + std::string(now - NOW < 10 ? "0" : "") +
                            std::to_string(now - NOW)},
                      Names{set_names(*m_mgr.get_media_stor()).back()});
        }
        EXPECT_EQ(c.to == MT_EXTERNAL, external().scanned());
    }
}

// The card can be scanned, but no set can be made there: back to, or on with, internal.
TEST_F(StorageManagerTest, NoSetOnTheCard) {
    init();
    plug_card();
    faults::fail(faults::MKDIR, 2, ENOSPC, 2);  // after the card's log root; both media
    EXPECT_FALSE(m_mgr.check_media_change());
    EXPECT_EQ(MT_NONE, m_mgr.media_type());
    EXPECT_EQ(nullptr, m_mgr.get_media_stor());
    faults::fail(faults::MKDIR, 1, ENOSPC);
    EXPECT_TRUE(m_mgr.check_media_change());
    EXPECT_EQ(MT_INTERNAL, m_mgr.media_type());
    faults::fail(faults::MKDIR, 1, ENOSPC);
    EXPECT_FALSE(m_mgr.check_media_change());
    EXPECT_TRUE(m_mgr.check_media_change());
    EXPECT_EQ(MT_EXTERNAL, m_mgr.media_type());
    // The card goes while the internal medium is full: it is in use all the same.
    pull_card();
    faults::set_time(NOW + 1);
    faults::fail(faults::MKDIR, 1, ENOSPC);
    EXPECT_TRUE(m_mgr.check_media_change());
    EXPECT_EQ(MT_INTERNAL, m_mgr.media_type());
}

TEST_F(StorageManagerTest, Init) {
    struct Case {
        const char* sd_root;  // in the root
        bool kest_layout;
        const char* top;
        const char* external_root;
    };
    for (const Case& c : {Case{"/sd", false, "/data", "/sd/modem_log"},
                          Case{"/sd", true, "/data/kest", "/sd/kest/modem_log"},
                          Case{nullptr, false, "/data", "/modem_log"},
                          Case{nullptr, true, "/data/kest", "/kest/modem_log"}}) {
        TestRoot root;
        root.make_dir("sd");
        root.set_prop("init.svc.fuse_sdcard0", "running");
        StorageManager mgr;
        mgr.set_kest_layout(c.kest_layout);
        EXPECT_EQ(0,
                  mgr.init(c.sd_root ? (root.root() + c.sd_root).c_str() : "", nullptr, nullptr));
        EXPECT_EQ(root.root() + c.top, mgr.get_media(MT_INTERNAL)->top_dir().string());
        EXPECT_EQ(root.root() + c.top + "/modem_log",
                  mgr.get_media(MT_INTERNAL)->log_root().string());
        EXPECT_EQ(root.root() + c.external_root, mgr.get_media(MT_EXTERNAL)->log_root().string());
        EXPECT_TRUE(root.exists(c.external_root));
        EXPECT_TRUE(mgr.get_media(MT_EXTERNAL)->scanned());
        EXPECT_EQ(MT_NONE, mgr.media_type());
    }
    m_root.write_file("plain", "");
    setenv("KESTMODEM_ROOT", m_root.root().c_str(), 1);
    plug_card();
    LogCapture log;
    init(m_root.path("plain").c_str());
    EXPECT_TRUE(log.has("init external storage failure ["));
}

TEST_F(StorageManagerTest, CardState) {
    for (const char* value : {"", "stopped", "Running", "running "}) {
        m_root.set_prop("init.svc.fuse_sdcard0", value);
        EXPECT_FALSE(m_mgr.is_sd_mounted()) << value;
    }
    plug_card();
    EXPECT_TRUE(m_mgr.is_sd_mounted());
}

TEST_F(StorageManagerTest, ClearAll) {
    m_root.write_file("sd/modem_log/2016-02-01-00-00-00/cp/f", "1");
    m_root.write_file("data/modem_log/2016-02-01-00-00-00/cp/f", "1");
    m_root.write_file("data/modem_log/sha1.txt", "1");
    init();
    subscribe();
    plug_card();
    EXPECT_TRUE(m_mgr.check_media_change());
    m_mgr.clear_all();
    EXPECT_EQ(Names{}, m_root.list("sd/modem_log"));
    EXPECT_EQ(Names{"sha1.txt"}, m_root.list("data/modem_log"));
    EXPECT_EQ(MT_NONE, m_mgr.media_type());
    EXPECT_TRUE(m_mgr.check_media_change());
    EXPECT_EQ("EE", m_events);
    EXPECT_EQ(1u, m_root.list("sd/modem_log").size());
}

// Subscribers that come and go, some of them while they are being called.
struct Ear {
    SubscriberList<void (*)(void*, int)>* list;
    std::string* heard;
    char name;
    Ear* leaves = nullptr;
    Ear* joins = nullptr;
    bool again = false;

    static void hear(void* client, int value) {
        Ear* self = static_cast<Ear*>(client);
        *self->heard += self->name;
        if (self->leaves) {
            self->list->remove(self->leaves);
        }
        if (self->joins) {
            self->list->add(self->joins, hear);
            self->joins = nullptr;
        }
        if (self->again) {
            self->again = false;
            self->list->notify(value);
        }
    }
};

TEST(SubscriberList, ChangesDuringARound) {
    SubscriberList<void (*)(void*, int)> list;
    std::string heard;
    Ear a{&list, &heard, 'a'}, b{&list, &heard, 'b'}, c{&list, &heard, 'c'}, d{&list, &heard, 'd'};
    auto round = [&] {
        heard.clear();
        list.notify(1);
        return heard;
    };
    EXPECT_EQ("", round());
    list.remove(&a);
    for (Ear* ear : {&a, &b, &c, &a}) {
        list.add(ear, Ear::hear);
    }
    EXPECT_EQ("abca", round());
    list.remove(&a);  // the first one only
    EXPECT_EQ("bca", round());
    b.leaves = &b;
    b.joins = &d;
    EXPECT_EQ("bca", round());
    EXPECT_EQ("cad", round());
    c.leaves = &a;
    c.again = true;
    EXPECT_EQ("ccdd", round());
    a.leaves = nullptr;
    EXPECT_EQ("cd", round());
}

}  // namespace
