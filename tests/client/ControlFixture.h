// A real controller on a temporary root, a control server of its own beside whatever
// the controller runs, and clients on real sockets. The tests drive the loop.
#ifndef TESTS_CLIENT_CONTROLFIXTURE_H_
#define TESTS_CLIENT_CONTROLFIXTURE_H_

#include "channels/CrashFixture.h"
#include "client/ClientHandler.h"
#include "client/ClientManager.h"
#include "config/ConfigFixture.h"
#include "control/LogController.h"

constexpr char TEST_SERVER[] = "control_test";

class ControlFixture : public ConfigFixture {
protected:
    ControlFixture() : config(file.c_str()) {
        signal(SIGPIPE, SIG_IGN);  // as the service does
        mkfifo(root.path("w_log").c_str(), 0600);
        root.set_prop("ro.modem.w.log", root.path("w_log"));
        // A CP that takes requests on its diag device and never answers.
        root.set_prop("ro.modem.w.diag", m_diag.path());
        root.write_file("kest_modem.conf",
                        "stream cp_wcdma off 0 3\nstream cp_wcn off 0 3\nlog_file_size 5\n");
        EXPECT_EQ(read(config), 0);
        EXPECT_EQ(ctrl.init(&config), 0);
    }

    Multiplexer& mux() { return ctrl.multiplexer(); }

    // What the peer got when it got as many bytes as expected, or when time is over.
    std::string replies(Client& peer, const std::string& expected) {
        pump_until(mux(), [&] { return peer.heard().size() >= expected.size(); });
        const std::string got = peer.heard();
        peer.forget();
        return got;
    }
    void talk(Client& peer, const std::string& request, const std::string& expected) {
        EXPECT_TRUE(peer.say(request));
        EXPECT_EQ(replies(peer, expected), expected) << request;
    }

    LogConfig config;
    LogController ctrl;

private:
    Pty m_diag;
};

// With the server and its clients of the test.
class ClientFixture : public ControlFixture {
protected:
    ClientFixture() { serve(3); }
    void serve(size_t max_clients) {
        manager.reset();
        manager.reset(new ClientManager(&ctrl, &mux(), max_clients));
        EXPECT_EQ(manager->init(TEST_SERVER), 0);
    }
    // Passes enough for whatever is there to be handled.
    void settle() {
        for (int i = 0; i < 5; ++i) {
            pump_once(mux());
        }
    }
    std::unique_ptr<ClientManager> manager;
};

#endif  // TESTS_CLIENT_CONTROLFIXTURE_H_
