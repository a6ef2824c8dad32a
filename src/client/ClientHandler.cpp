// SPDX-License-Identifier: Apache-2.0

#include "client/ClientHandler.h"

#include <poll.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include "channels/LogPipeHandler.h"
#include "client/ClientManager.h"
#include "core/log.h"
#include "core/text.h"

namespace {

// What a client is polled for while its transaction runs and nothing is read from it. poll
// reports a hang-up unasked; this only keeps the client in the loop's table, as long as it is
// there: a hang-up means that both directions are gone. A client that shut down its writing end
// alone, as a pipe into a network tool does after its last request, still waits for its reply.
constexpr int GONE_EVENTS = POLLHUP;

// One write: what a client that does not read has no room for is lost, and a late
// rest of a line would only garble the next one.
int send_all(int fd, const char* text, size_t len) {
    return write(fd, text, len) == static_cast<ssize_t>(len) ? 0 : -1;
}

}  // namespace

ClientHandler::ClientHandler(int fd, LogController* ctrl, Multiplexer* mux, ClientManager* manager)
    : BufferedFdHandler(fd, ctrl, mux, MAX_REQUEST), m_manager(manager) {}

ClientHandler::~ClientHandler() {
    cancel_trans();
}

void ClientHandler::process(int events) {
    if (m_trans_state == CTS_EXECUTING) {
        // It hung up: others may have its place. What it has sent waits for the end of the
        // transaction all the same, which a request might end.
        del_events(GONE_EVENTS);
        m_gone = m_gone || (events & GONE_EVENTS);
        m_manager->resume_listening();
        return;
    }
    BufferedFdHandler::process(events);
}

int ClientHandler::process_data() {
    note_alive();
    uint8_t* const begin = m_buffer.get();
    const uint8_t* const end = begin + m_data_len;
    const uint8_t* req = begin;
    for (const uint8_t* p = begin; p < end; ++p) {
        if (*p == '\n' || *p == '\0') {
            process_req(req, static_cast<size_t>(p - req));
            req = p + 1;
        }
    }
    m_data_len = static_cast<size_t>(end - req);
    if (req != begin) {
        memmove(begin, req, m_data_len);
    }
    return 0;
}

void ClientHandler::process_req(const uint8_t* req, size_t len) {
    size_t keyword_len;
    const uint8_t* keyword = get_token(req, len, keyword_len);
    if (!keyword) {
        return;
    }
    const RequestHandler handler = find_handler(keyword, keyword_len);
    if (!handler) {
        err_log("unknown request");
        return reply(RC_UNKNOWN_REQUEST);
    }
    const uint8_t* params = keyword + keyword_len;
    (this->*handler)(params, static_cast<size_t>(req + len - params));
}

void ClientHandler::process_conn_closed() {
    cancel_trans();
    m_manager->process_client_disconn(this);
}

void ClientHandler::process_conn_error(int /*err*/) {
    process_conn_closed();
}

int ClientHandler::notify_cp_dump(CpType type, CpDumpEvent event) {
    if (type < 0 || type >= CP_TYPE_NUM || event < CDE_START || event > CDE_END ||
        !m_dump_subscribed[type]) {
        return 0;
    }
    char line[128];
    const int len = snprintf(line, sizeof(line), "%s%s\n",
                             event == CDE_START ? "CP_DUMP_START " : "CP_DUMP_END ",
                             cp_type_to_request_name(type));
    return send_all(m_fd, line, static_cast<size_t>(len));
}

void ClientHandler::notify_trans_result(int result) {
    if (m_trans_state != CTS_EXECUTING) {
        err_log("Non CTS_EXECUTING state notification %d", result);
        return;
    }
    switch (m_trans_type) {
        case CTT_SLEEP_LOG:
            proc_sleep_log_result(result);
            break;
        case CTT_RINGBUF:
            proc_ringbuf_result(result);
            break;
        default:
            err_log("Unknown transaction %d result %d", static_cast<int>(m_trans_type), result);
            break;
    }
}

int ClientHandler::start_trans(ClientTransType type, LogPipeHandler* channel) {
    if (m_trans_state != CTS_IDLE) {
        return CR_BUSY;
    }
    // Before the channel starts: its result may come while it is starting.
    const ClientTransType last_type = m_trans_type;
    m_trans_type = type;
    m_trans_state = CTS_EXECUTING;
    m_trans_channel = channel;
    const int result =
        type == CTT_SLEEP_LOG ? channel->save_sleep_log(this) : channel->save_ringbuf(this);
    if (result != CR_STARTED) {
        m_trans_type = last_type;
        m_trans_state = CTS_IDLE;
        m_trans_channel = nullptr;
    } else if (m_trans_state == CTS_EXECUTING) {
        // First the new event: the place in the loop's table must not be lost.
        poll_when_room(GONE_EVENTS, "client");
        del_events(POLLIN);
    }
    return result;
}

void ClientHandler::end_trans(int result) {
    m_trans_state = CTS_IDLE;
    m_trans_channel = nullptr;
    poll_when_room(POLLIN, "client");
    del_events(GONE_EVENTS);
    reply(result_to_error(result));
}

void ClientHandler::cancel_trans() {
    if (m_trans_state == CTS_IDLE) {
        return;
    }
    if (m_trans_channel) {
        m_trans_channel->cancel_trans_result_notify(this);
    }
    m_trans_state = CTS_IDLE;
    m_trans_channel = nullptr;
}

int ClientHandler::result_to_error(int result) {
    switch (result) {
        case CR_OK:
            return RC_OK;
        case CR_BUSY:
            return RC_BUSY;
        case CR_LOG_DISABLED:
            return RC_LOG_DISABLED;
        case CR_NO_SLEEP_LOG:
            return RC_NO_SLEEP_LOG;
        case CR_NO_RINGBUF:
            return RC_NO_RINGBUF;
        case CR_NOT_WORKING:
            return RC_CP_NOT_WORKING;
        default:
            return RC_FAILED;
    }
}

int ClientHandler::send_response(int fd, int code) {
    if (code == RC_OK) {
        return send_all(fd, "OK\n", 3);
    }
    char line[32];
    const int len = snprintf(line, sizeof(line), "ERROR %d\n", code);
    return send_all(fd, line, static_cast<size_t>(len));
}

void ClientHandler::reply_number(unsigned int number) {
    char line[64];
    const int len = snprintf(line, sizeof(line), "OK %u\n", number);
    send_all(m_fd, line, static_cast<size_t>(len));
}

void ClientHandler::reply_word(const char* word) {
    char line[64];
    const int len = snprintf(line, sizeof(line), "OK %s\n", word);
    send_all(m_fd, line, static_cast<size_t>(len));
}
