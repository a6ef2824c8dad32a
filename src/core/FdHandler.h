// Base of every object that owns a descriptor the service waits on. The object is the
// identity of its registration with the Multiplexer; it owns its descriptor, so
// destroying a handler unregisters it and closes the descriptor. Handlers are owned by
// whoever creates them, never by the Multiplexer, and may be destroyed at any time on
// the loop's thread, also from their own process().
#ifndef CORE_FDHANDLER_H_
#define CORE_FDHANDLER_H_

class LogController;
class Multiplexer;

class FdHandler {
public:
    // Takes over fd (-1: none open yet). Registers nothing. ctrl and mux are not owned
    // and outlive the handler.
    FdHandler(int fd, LogController* ctrl, Multiplexer* mux);
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

    Multiplexer* multiplexer() const { return m_multiplexer; }

    // Adds poll events to the registration, or makes it. 0, or -1 when the loop's table
    // is full. The descriptor is the one open at the next pass of the loop.
    int add_events(int events);

    // Drops poll events; without any left the handler is no longer registered. To be
    // called before the descriptor is closed or replaced.
    void del_events(int events);

    // Closes the descriptor, if any, and forgets it; the registration stays. Returns the
    // result of the system call, 0 when none was open.
    int close();

protected:
    int m_fd;
    LogController* m_log_ctrl;
    Multiplexer* m_multiplexer;
};

#endif  // CORE_FDHANDLER_H_
