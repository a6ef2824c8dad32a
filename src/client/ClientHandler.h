// SPDX-License-Identifier: Apache-2.0
// One connection to the control socket: splits what the client sends into requests,
// carries them out through the LogController and answers each with one line.
//
// Owned by the ClientManager, which destroys it when the client is gone. A channel that
// runs a transaction for the client refers to it until it has delivered the result by
// trans_ended. Nothing here ever waits for the client: what its socket does not
// take is lost. Loop thread only.
#ifndef CLIENT_CLIENTHANDLER_H_
#define CLIENT_CLIENTHANDLER_H_

#include <stddef.h>
#include <stdint.h>

#include "channels/CpDumpEvent.h"
#include "channels/TransClient.h"
#include "client/BufferedFdHandler.h"
#include "client/RequestTable.h"
#include "config/CpType.h"
#include "core/ObjectRef.h"

class ClientManager;
class LogPipeHandler;

class ClientHandler : public BufferedFdHandler, public TransClient {
public:
    enum ClientTransType : int { CTT_NONE = 0, CTT_SLEEP_LOG = 1, CTT_RINGBUF = 2 };
    enum ClientTransState : int { CTS_IDLE = 0, CTS_EXECUTING = 1 };

    // A request with its terminator has to fit.
    static constexpr size_t MAX_REQUEST = MAX_REQUEST_LEN + 1;

    // Takes over fd; manager is not owned.
    ClientHandler(int fd, LogController* ctrl, Multiplexer* mux, ClientManager* manager);
    ~ClientHandler() override;

    void process(int events) override;

    int process_data() override;
    void process_conn_closed() override;
    void process_conn_error(int err) override;

    // Handles one request, given without its terminator. Never destroys the object.
    void process_req(const uint8_t* req, size_t len);

    // It has hung up, and is there until its transaction has ended and what it sent is carried out.
    bool gone() const { return m_gone; }

    // Sends the line on the CP's dump if the client has subscribed to the CP. 0, or -1
    // when the line could not be written whole.
    int notify_cp_dump(CpType type, CpDumpEvent event);

    void trans_ended(int result) override { notify_trans_result(result); }
    // The client's transaction has ended. Not virtual: a log text begins with its signature.
    void notify_trans_result(int result);
    // The same for a client whose transaction of that kind runs.
    void proc_sleep_log_result(int result);
    void proc_ringbuf_result(int result);

    // Reply code for the result of an operation (ChannelResult; any other value is a failure).
    static int result_to_error(int result);
    // Writes the reply with that code to a client's socket: OK for 0, else the error. 0, or
    // -1 when it could not be written whole.
    static int send_response(int fd, int code);

private:
    // Codes of error replies.
    enum ReplyCode : int {
        RC_OK = 0,
        RC_UNKNOWN_REQUEST = 1,
        RC_BAD_PARAM = 2,
        RC_FAILED = 3,
        RC_BUSY = 4,
        RC_LOG_DISABLED = 5,
        RC_NO_SLEEP_LOG = 6,
        RC_NO_RINGBUF = 7,
        RC_CP_NOT_WORKING = 8,
        RC_UNKNOWN_CP = 9
    };

    // Carries out one kind of request. Gets the text after the keyword, which is not
    // NUL-terminated.
    typedef void (ClientHandler::*RequestHandler)(const uint8_t* params, size_t len);
    // The handler of a keyword, or null.
    static RequestHandler find_handler(const uint8_t* keyword, size_t len);

    void proc_flush(const uint8_t* params, size_t len);
    void proc_kestctl(const uint8_t* params, size_t len);
    void proc_enable_iq(const uint8_t* params, size_t len);
    void proc_disable_iq(const uint8_t* params, size_t len);
    void proc_enable_md(const uint8_t* params, size_t len);
    void proc_disable_md(const uint8_t* params, size_t len);
    void proc_mini_dump(const uint8_t* params, size_t len);
    void proc_enable_log(const uint8_t* params, size_t len);
    void proc_disable_log(const uint8_t* params, size_t len);
    void proc_get_log_state(const uint8_t* params, size_t len);
    void proc_subscribe(const uint8_t* params, size_t len);
    void proc_unsubscribe(const uint8_t* params, size_t len);
    void proc_ringbuf(const uint8_t* params, size_t len);
    void proc_sleep_log(const uint8_t* params, size_t len);
    void proc_get_sd_size(const uint8_t* params, size_t len);
    void proc_set_sd_size(const uint8_t* params, size_t len);
    void proc_get_data_part_size(const uint8_t* params, size_t len);
    void proc_set_data_part_size(const uint8_t* params, size_t len);
    void proc_get_log_file_size(const uint8_t* params, size_t len);
    void proc_set_log_file_size(const uint8_t* params, size_t len);
    void proc_get_md_pos(const uint8_t* params, size_t len);
    void proc_set_md_pos(const uint8_t* params, size_t len);
    void proc_get_log_overwrite(const uint8_t* params, size_t len);
    void proc_enable_overwrite(const uint8_t* params, size_t len);
    void proc_disable_overwrite(const uint8_t* params, size_t len);

    // Has the channel start a transaction for this client: CR_STARTED when it runs (or has
    // even ended already), otherwise why not, as a negative ChannelResult.
    int start_trans(ClientTransType type, LogPipeHandler* channel);
    // Frees the transaction slot, resumes reading and replies.
    void end_trans(int result);
    void cancel_trans();

    void reply(int code) { send_response(m_fd, code); }
    void reply_number(unsigned int number);
    void reply_word(const char* word);

    ClientManager* m_manager;
    ClientTransType m_trans_type = CTT_NONE;
    ClientTransState m_trans_state = CTS_IDLE;
    ObjectRef<LogPipeHandler> m_trans_channel;
    bool m_gone = false;
    bool m_dump_subscribed[CP_TYPE_NUM] = {};
};

#endif  // CLIENT_CLIENTHANDLER_H_
