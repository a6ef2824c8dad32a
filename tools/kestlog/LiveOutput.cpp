// SPDX-License-Identifier: Apache-2.0

#include "kestlog/LiveOutput.h"

#include <errno.h>
#include <limits.h>
#include <stdlib.h>
#include <string.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>

namespace {

constexpr char HIDE_CURSOR[] = "\033[?25l";
constexpr char SHOW_CURSOR[] = "\033[?25h";
constexpr char ERASE_BELOW[] = "\r\033[J";

bool understands_escapes() {
    const char* const term = getenv("TERM");
    return term && *term && strcmp(term, "dumb") != 0;
}

winsize window() {
    winsize size;
    if (ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) < 0 || size.ws_col == 0 || size.ws_row == 0) {
        size.ws_col = 80;
        size.ws_row = 24;
    }
    return size;
}

}  // namespace

LiveOutput::LiveOutput(bool json)
    : m_json(json), m_has_table(!json && isatty(STDOUT_FILENO) && understands_escapes()) {}

void LiveOutput::tell(const LiveEvent& event) {
    erase();
    m_text += (m_json ? json_line(event.json) : event.line) + "\n";
}

void LiveOutput::draw(const std::vector<std::string>& rows) {
    erase();
    const winsize size = window();
    const size_t width = size.ws_col;
    const size_t height = size.ws_row;
    const size_t count = std::min(rows.size(), std::max<size_t>(height - 1, 1));
    for (size_t i = 0; i < count; ++i) {
        // A row as long as the window is wide would begin the next one in some terminals.
        const std::string row = rows[i].substr(0, std::max<size_t>(width - 1, 1));
        m_text += (i ? "\n" : "") + row;
        m_on_screen.push_back(row.size());
    }
}

// A window that has become narrower shows a row of the table in several.
void LiveOutput::erase() {
    const size_t width = window().ws_col;
    size_t rows = 0;
    for (const size_t length : m_on_screen) {
        rows += std::max<size_t>((length + width - 1) / width, 1);
    }
    if (rows > 1) {
        m_text += "\033[" + std::to_string(rows - 1) + "A";
    }
    m_text += rows ? ERASE_BELOW : "";
    m_on_screen.clear();
}

void LiveOutput::enter() {
    if (!m_has_table || m_entered) {
        return;
    }
    m_entered = true;
    m_text += HIDE_CURSOR;
    // A program in the background would be stopped.
    if (tcgetpgrp(STDOUT_FILENO) == getpgrp() && tcgetattr(STDOUT_FILENO, &m_before) == 0) {
        struct termios quiet = m_before;
        quiet.c_lflag &= ~static_cast<tcflag_t>(ECHO);
        m_echo_off = tcsetattr(STDOUT_FILENO, TCSANOW, &quiet) == 0;
    }
}

void LiveOutput::leave() {
    if (!m_entered) {
        return;
    }
    m_entered = false;
    m_text += std::string(m_on_screen.empty() ? "" : "\n") + SHOW_CURSOR;
    m_on_screen.clear();
    if (m_echo_off && tcgetpgrp(STDOUT_FILENO) == getpgrp()) {
        tcsetattr(STDOUT_FILENO, TCSANOW, &m_before);
    }
    m_echo_off = false;
}

bool LiveOutput::write_some() {
    // A pipe that is ready takes that much.
    const size_t piece = std::min<size_t>(m_text.size() - m_written, PIPE_BUF);
    const ssize_t n = write(STDOUT_FILENO, m_text.data() + m_written, piece);
    if (n < 0) {
        return errno == EINTR || errno == EAGAIN;
    }
    m_written += static_cast<size_t>(n);
    if (!pending()) {
        m_text.clear();
        m_written = 0;
    }
    return true;
}
