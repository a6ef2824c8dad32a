// SPDX-License-Identifier: Apache-2.0
// Thousands of crashes, transactions and clients: nothing may grow.
#include <malloc.h>

#include "support/ServiceFixture.h"

namespace {

#ifdef NDEBUG
constexpr int ROUNDS = 10000;
#else
constexpr int ROUNDS = 1000;
#endif

class SoakTest : public CrashFixture {
protected:
    // One client, one dump, one transaction and a recovery.
    bool round(int i) {
        Client client;
        const std::string lines = "CP_DUMP_START WCDMA\nCP_DUMP_END WCDMA\n";
        if (ask(client, "SUBSCRIBE WCDMA DUMP\n", "OK\n") != "OK\n") {
            return false;
        }
        modem()->process_assert(i % 2 == 0);
        if (i % 5 == 4) {
            modem()->process_alive();  // cuts the dump off
        } else if (!diag_dev.put("memory" + end_marker())) {
            return false;
        }
        if (hear(client, lines) != lines) {
            return false;
        }
        modem()->process_alive();
        diag_dev.forget();
        if (!client.say("SAVE_RINGBUF WCDMA\n") ||
            !pump([&] { return modem()->state() != CWS_WORKING; })) {
            return false;
        }
        enum { REFUSED = 4, CLIENT_GONE, RECOVERED };
        const int fate = i % 7;
        const std::string reply = fate == CLIENT_GONE ? "" : fate < REFUSED ? "OK\n" : "ERROR 3\n";
        if (fate == CLIENT_GONE) {
            client.hang_up();
        }
        if (fate == RECOVERED) {
            modem()->process_alive();
        } else if (!diag_dev.put(frame(0x3A, 'd', "data") + frame(0x3A, fate == REFUSED ? 9 : 1))) {
            return false;
        }
        return pump([&] { return modem()->state() == CWS_WORKING; }) &&
               (reply.empty() || hear(client, reply) == reply);
    }
    void rounds(int from, int to) {
        for (int i = from; i < to; ++i) {
            ASSERT_TRUE(round(i)) << i;
            if (i % 100 == 99) {
                log.clear();
                faults::reset();  // which keeps every command of the shell until then
                ASSERT_TRUE(both_log("alive"));
                ASSERT_EQ(ctrl->clear_log(), 0);
            }
        }
        // The last clients' ends are seen.
        EXPECT_TRUE(pump([&] { return Filler::free_slots(mux()) == m_slots; }));
    }

    size_t m_slots = 0;
};

TEST_F(SoakTest, TenThousandCrashesTransactionsAndClients) {
    boot_modem(true);
    root.write_file("proc/cpw/mini_dump", "mini");
    m_slots = Filler::free_slots(mux());
    ASSERT_NO_FATAL_FAILURE(rounds(0, 200));
    const size_t descriptors = lasting_descriptors();
    [[maybe_unused]] const size_t memory = mallinfo2().uordblks;
    ASSERT_NO_FATAL_FAILURE(rounds(200, 200 + ROUNDS));
    EXPECT_EQ(lasting_descriptors(), descriptors);
#ifndef __SANITIZE_ADDRESS__  // it has its own check
    EXPECT_LT(mallinfo2().uordblks, memory + 16384);
#endif
}

}  // namespace
