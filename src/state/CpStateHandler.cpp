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

// Writes len bytes as one line of printable text: line ends and NULs at the end are left
// out, whatever is not printable ASCII, and the backslash, becomes \xNN. text has room
// for four bytes a byte and a NUL.
void make_printable(const uint8_t* bytes, size_t len, char* text) {
    static const char digits[] = "0123456789abcdef";
    while (len && (bytes[len - 1] == '\n' || bytes[len - 1] == '\r' || bytes[len - 1] == '\0')) {
        --len;
    }
    for (size_t i = 0; i < len; ++i) {
        const uint8_t c = bytes[i];
        if (c >= ' ' && c <= '~' && c != '\\') {
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
    : BufferedFdHandler(-1, ctrl, mux, BUFFER_SIZE), m_serv_name(serv_name) {}

CpStateHandler::~CpStateHandler() {
    cancel_reconnect();
}

int CpStateHandler::init() {
    cancel_reconnect();
    if (m_fd < 0 && !connect()) {
        m_reconnect_timer = m_multiplexer->timer_mgr().create_timer(RECONNECT_MS, reconnect, this);
        if (!m_reconnect_timer) {
            err_log("clock_gettime CLOCK_BOOTTIME error");
        }
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
    if (add_events(POLLIN) < 0) {
        info_log("no room to poll %s, trying again later", m_serv_name.string());
        close();
        return false;
    }
    return true;
}

void CpStateHandler::cancel_reconnect() {
    if (m_reconnect_timer) {
        m_multiplexer->timer_mgr().del_timer(m_reconnect_timer);
        m_reconnect_timer = nullptr;
    }
}

void CpStateHandler::reconnect(void* handler) {
    CpStateHandler* const self = static_cast<CpStateHandler*>(handler);
    self->m_reconnect_timer = nullptr;
    self->init();
}

int CpStateHandler::process_data() {
    char text[4 * BUFFER_SIZE + 1];
    make_printable(m_buffer, m_data_len, text);
    info_log("%u bytes: %s", static_cast<unsigned int>(m_data_len), text);
    CpType type = CT_UNKNOWN;
    const CpEvent event = parse_notify(m_buffer, m_data_len, type);
    if (event != CE_NONE) {
        m_log_ctrl->process_cp_evt(type, event);
    }
    m_data_len = 0;
    return 0;
}

void CpStateHandler::process_conn_closed() {
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
