// SPDX-License-Identifier: Apache-2.0
// Connection to a supervisor, a process that watches a CP and announces what happens to
// it in short texts. Connects and reconnects for ever, hands what it reads to the
// subclass to recognise, and passes events on to the LogController. A connection that
// ends within LASTING_MS is an idle wake-up, whatever it told, so that a supervisor
// which accepts and closes at once is not reconnected without end.
//
// Owned by the LogController. The supervisor's bytes are not trusted. Loop thread only.
#ifndef STATE_CPSTATEHANDLER_H_
#define STATE_CPSTATEHANDLER_H_

#include <utils/String8.h>

#include "client/BufferedFdHandler.h"
#include "config/CpType.h"

class CpStateHandler : public BufferedFdHandler {
public:
    enum CpEvent : int { CE_NONE = 0, CE_ASSERT = 1, CE_BLOCKED = 2, CE_ALIVE = 3 };

    // How long a supervisor that cannot be reached is left alone.
    static constexpr unsigned int RECONNECT_MS = 3000;

    // serv_name: the supervisor's local socket, copied. Does not connect until init().
    CpStateHandler(LogController* ctrl, Multiplexer* mux, const char* serv_name);
    ~CpStateHandler() override;

    // Connects, or arms a retry. Always 0. Nothing happens when it is connected.
    int init();

    int process_data() override;
    void process_conn_closed() override;
    void process_conn_error(int err) override;

    // The event that the text tells of, CE_NONE without any. Sets type with an event.
    virtual CpEvent parse_notify(const uint8_t* buf, size_t len, CpType& type) = 0;

protected:
    // A text that may occur anywhere in a message, and what it tells.
    struct Pattern {
        const char* text;
        CpEvent event;
    };

    // The event of the first of the patterns that occurs in the text.
    template <size_t N>
    static CpEvent find_event(const uint8_t* buf, size_t len, const Pattern (&patterns)[N]) {
        return find_event(buf, len, patterns, N);
    }

private:
    static constexpr size_t BUFFER_SIZE = 256;
    // A rest included: only after it is the end of a connection seen.
    static constexpr unsigned int LASTING_MS = REST_MS + RECONNECT_MS;

    static CpEvent find_event(const uint8_t* buf, size_t len, const Pattern* patterns,
                              size_t pattern_num);
    static void reconnect(void* handler);
    static void connection_lasts(void* handler);
    bool connect();

    const android::String8 m_serv_name;
    OneShotTimer m_reconnect_timer;
    OneShotTimer m_young_timer;  // the connection has not lasted yet
};

#endif  // STATE_CPSTATEHANDLER_H_
