// SPDX-License-Identifier: Apache-2.0
// A controller on a temporary root, a control server of its own beside the one that the
// controller runs, and clients on real sockets. The tests drive the loop.
#ifndef TESTS_SUPPORT_CONTROLFIXTURE_H_
#define TESTS_SUPPORT_CONTROLFIXTURE_H_

#include "client/ClientHandler.h"
#include "client/ClientManager.h"
#include "support/ServiceFixture.h"

constexpr char TEST_SERVER[] = "control_test";

class ControlFixture : public CrashFixture {
protected:
    // WCDMA takes requests on its diag device and never answers; nothing is logged at first.
    ControlFixture() {
        root.set_prop("ro.modem.w.log", own_log_dev.path());
        root.set_prop("ro.modem.w.diag", diag_dev.path());
        EXPECT_EQ(boot("stream cp_wcdma off 0 3\nstream cp_wcn off 0 3\nlog_file_size 5\n"), 0);
        serve(3);
    }

    void serve(size_t max_clients) {
        manager.reset(new ClientManager(ctrl.get(), &mux(), max_clients));
        EXPECT_EQ(manager->init(TEST_SERVER), 0);
    }
    void talk(Client& client, const std::string& request, const std::string& expected) {
        EXPECT_EQ(ask(client, request, expected), expected) << request;
    }

    std::unique_ptr<ClientManager> manager;
};

#endif  // TESTS_SUPPORT_CONTROLFIXTURE_H_
