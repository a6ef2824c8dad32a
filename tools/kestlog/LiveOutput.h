// SPDX-License-Identifier: Apache-2.0
// The standard output of kestlog follow: lines or objects and, on a terminal, a table below the
// lines that is drawn again and again. Text waits here until the reader takes it: the owner calls
// write_some when the descriptor is ready. Gives the terminal back as it was.
#ifndef KESTLOG_LIVEOUTPUT_H_
#define KESTLOG_LIVEOUTPUT_H_

#include <termios.h>

#include <string>
#include <vector>

#include "kestlog/LiveEvent.h"

class LiveOutput {
public:
    explicit LiveOutput(bool json);
    LiveOutput(const LiveOutput&) = delete;
    LiveOutput& operator=(const LiveOutput&) = delete;

    bool has_table() const { return m_has_table; }
    void tell(const LiveEvent& event);
    // Draws the table anew, cut to the size of the terminal.
    void draw(const std::vector<std::string>& rows);
    bool drawn() const { return !m_has_table || !m_on_screen.empty(); }
    // Hides the cursor and what is typed; leave undoes it and goes below the table.
    void enter();
    void leave();

    bool pending() const { return m_written < m_text.size(); }
    // Writes a piece that a ready descriptor takes at once. False, with errno, on failure.
    bool write_some();

private:
    void erase();

    const bool m_json;
    bool m_has_table;
    std::string m_text;
    size_t m_written = 0;             // of it
    std::vector<size_t> m_on_screen;  // lengths of the table's rows
    bool m_entered = false;
    bool m_echo_off = false;
    struct termios m_before {};
};

#endif  // KESTLOG_LIVEOUTPUT_H_
