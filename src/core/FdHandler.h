// SPDX-License-Identifier: Apache-2.0
// Base of every object that owns a descriptor the service waits on. The object is the
// identity of its registration with the Multiplexer; it owns its descriptor, so
// destroying a handler unregisters it and closes the descriptor. Handlers are owned by
// whoever creates them, never by the Multiplexer, and may be destroyed at any time on
// the loop's thread, also from their own process().
//
// A handler whose wake-ups keep getting nothing done would take a whole processor: a device
// that hung up, say, is ready for ever. Each handler therefore says what a wake-up came to
// (note_alive, note_idle). After IDLE_LIMIT idle ones in a row the loop leaves the handler
// alone for REST_MS, then polls it again; until it gives data, one idle wake-up is enough
// for the next rest.
#ifndef CORE_FDHANDLER_H_
#define CORE_FDHANDLER_H_

#include "core/OneShotTimer.h"

class LogController;
class Multiplexer;

class FdHandler {
public:
    static constexpr unsigned int IDLE_LIMIT = 10;
    static constexpr unsigned int REST_MS = 3000;

    // Whom the handler serves, which decides when it waits for room in the loop's table.
    enum Service {
        SERVES_LOG,      // a log or crash material
        SERVES_CONTROL,  // requests and supervisors: captures leave them room
        SERVES_CAPTURE   // gives its place to those that serve a log
    };

    // Takes over fd (-1: none open yet). Registers nothing. ctrl and mux are not owned
    // and outlive the handler.
    FdHandler(int fd, LogController* ctrl, Multiplexer* mux, Service service = SERVES_LOG);
    // Leaves no registration behind, whatever events it was for, and closes the
    // descriptor if one is open.
    virtual ~FdHandler();
    FdHandler(const FdHandler&) = delete;
    FdHandler& operator=(const FdHandler&) = delete;

    // Called by the loop with the poll result bits (POLLIN, POLLHUP, POLLERR, ...) of
    // the descriptor.
    virtual void process(int events) = 0;

    // The descriptor, -1 when none is open.
    int fd() const { return m_fd; }
    Service service() const { return m_service; }

    LogController* log_ctrl() const { return m_log_ctrl; }
    Multiplexer* multiplexer() const { return m_multiplexer; }

    // Adds poll events to the registration, or makes it. 0, or -1 when the loop's table
    // is full. The descriptor is the one open at the next pass of the loop.
    int add_events(int events);

    // As add_events, but a handler for which the table has no room waits for it: the loop
    // polls it as soon as others have left. what names the handler in the message.
    void poll_when_room(int events, const char* what);

    // Drops poll events; without any left the handler is no longer registered. To be
    // called before the descriptor is closed or replaced.
    void del_events(int events);

    // The loop passes over the descriptor, which keeps its place or its turn for one, until
    // events are added again.
    void hold_events();
    bool held() const { return m_held; }

    // Closes the descriptor, if any, and forgets it; the registration stays. Returns the
    // result of the system call, 0 when none was open.
    int close();

    // A wake-up got something done, or the descriptor is a new one that deserves a fresh
    // start: counting begins again and a rest ends.
    void note_alive() {
        if (m_idle_wakeups) {
            end_rest();
        }
    }
    // A wake-up got nothing done: a read of 0, a hang-up, an error. The first rest in a row
    // is logged; what names the handler in the message.
    void note_idle(const char* what);
    // Idle wake-ups since the last note_alive, counted up to IDLE_LIMIT.
    unsigned int idle_wakeups() const { return m_idle_wakeups; }
    // True while the loop leaves the handler alone.
    bool resting() const { return m_rest_timer.pending(); }

protected:
    int m_fd;
    LogController* m_log_ctrl;
    Multiplexer* m_multiplexer;

private:
    static void on_rest_over(void* handler);
    void end_rest();
    void end_hold();

    const Service m_service;
    bool m_held = false;
    unsigned int m_idle_wakeups = 0;
    bool m_rest_logged = false;
    OneShotTimer m_rest_timer;
};

#endif  // CORE_FDHANDLER_H_
