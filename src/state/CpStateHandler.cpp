// SPDX-License-Identifier: Apache-2.0

#include "state/CpStateHandler.h"

#include <cutils/sockets.h>
#include <poll.h>
#include <string.h>
#include <sys/socket.h>

#include "control/LogController.h"
#include "core/Multiplexer.h"
#include "core/log.h"
#include "core/text.h"

namespace {

// Writes the bytes up to the first NUL as text of one line: without line feeds at its end, and
// control bytes other than a tab become \xNN; all others stay as they are. text has room for four
// bytes a byte and a NUL.
void make_line(const uint8_t* bytes, size_t len, char* text) {
    static const char digits[] = "0123456789abcdef";
    len = strnlen(reinterpret_cast<const char*>(bytes), len);
    while (len > 0 && bytes[len - 1] == '\n') {
        --len;
    }
    for (size_t i = 0; i < len; ++i) {
        const uint8_t c = bytes[i];
        if ((c >= ' ' && c != 0x7f) || c == '\t') {
            *text++ = static_cast<char>(c);
        } else {
            *text++ = '\\';
            *text++ = 'x';
            *text++ = digits[c >> 4];
            *text++ = digits[c & 15];
        }
    }
    *text = '\0';
}

}  // namespace

CpStateHandler::CpStateHandler(LogController* ctrl, Multiplexer* mux, const char* serv_name)
    : BufferedFdHandler(-1, ctrl, mux, BUFFER_SIZE),
      m_serv_name(serv_name),
      m_reconnect_timer(&mux->timer_mgr(), reconnect, this),
      m_young_timer(&mux->timer_mgr(), connection_lasts, this) {}

CpStateHandler::~CpStateHandler() = default;

int CpStateHandler::init() {
    m_reconnect_timer.stop();
    if (m_fd < 0 && !connect()) {
        m_reconnect_timer.start_or_log(RECONNECT_MS);
    }
    return 0;
}

bool CpStateHandler::connect() {
    // Non-blocking: connecting to a supervisor that hangs, its queue full, would wait.
    m_fd = socket_local_client(m_serv_name.string(), ANDROID_SOCKET_NAMESPACE_ABSTRACT,
                               SOCK_STREAM | SOCK_NONBLOCK);
    if (m_fd < 0) {
        return false;
    }
    m_young_timer.start(LASTING_MS);  // without a clock every connection counts as lasting
    poll_when_room(POLLIN, m_serv_name.string());
    return true;
}

void CpStateHandler::reconnect(void* handler) {
    static_cast<CpStateHandler*>(handler)->init();
}

void CpStateHandler::connection_lasts(void* handler) {
    static_cast<CpStateHandler*>(handler)->note_alive();
}

int CpStateHandler::process_data() {
    if (!m_young_timer.pending()) {
        note_alive();
    }
    char text[4 * BUFFER_SIZE + 1];
    make_line(m_buffer.get(), m_data_len, text);
    info_log("%u bytes: %s", static_cast<unsigned int>(m_data_len), text);
    CpType type = CT_UNKNOWN;
    const CpEvent event = parse_notify(m_buffer.get(), m_data_len, type);
    if (event != CE_NONE) {
        m_log_ctrl->process_cp_evt(type, event);
    }
    m_data_len = 0;
    return 0;
}

void CpStateHandler::process_conn_closed() {
    if (m_young_timer.pending()) {
        m_young_timer.stop();
        note_idle(m_serv_name.string());
    }
    del_events(POLLIN);
    close();
    init();
}

void CpStateHandler::process_conn_error(int /*err*/) {
    process_conn_closed();
}

CpStateHandler::CpEvent CpStateHandler::find_event(const uint8_t* buf, size_t len,
                                                   const Pattern* patterns, size_t pattern_num) {
    for (size_t i = 0; i < pattern_num; ++i) {
        if (find_bytes(buf, len, patterns[i].text, strlen(patterns[i].text))) {
            return patterns[i].event;
        }
    }
    return CE_NONE;
}
