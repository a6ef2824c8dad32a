// The surroundings of a consumer: a channel's storage, and a device that hands over exactly
// the chunks that were sent, one a read.
#ifndef TESTS_FUZZ_EXCHANGE_H_
#define TESTS_FUZZ_EXCHANGE_H_

#include <poll.h>
#include <sys/socket.h>

#include <functional>
#include <sstream>
#include <string>
#include <vector>

#include "channels/DataConsumer.h"
#include "channels/DiagDeviceHandler.h"
#include "channels/LogPipeHandler.h"
#include "control/LogController.h"
#include "fuzz/fuzz.h"
#include "storage/CpDirectory.h"
#include "storage/CpStorage.h"
#include "support/TestRoot.h"

class Exchange {
public:
    static constexpr int GOES_ON = -1;

    typedef std::function<DataConsumer*(const char* cp_name, CpStorage* storage)> Maker;

    explicit Exchange(CpType cp) : m_config(m_settings.path.c_str()) {
        for (const std::string device : {"log", "diag"}) {
            m_root.set_prop("ro.modem.w." + device, "/dev/null");
        }
        m_settings.write("stream cp_wcdma off 0 3\nstream cp_wcn off 0 3\n");
        FUZZ_CHECK(fuzz_read(m_config) == 0 && m_ctrl.init(&m_config) == 0);
        m_channel = m_ctrl.get_cp(cp);
        FUZZ_CHECK(m_channel && m_channel->create_storage() == 0);
    }

    // Runs a consumer over the chunks, as far as it wants them.
    void run(const Maker& make, const std::vector<std::string>& chunks) {
        int fds[2];
        FUZZ_CHECK(socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_NONBLOCK | SOCK_CLOEXEC, 0, fds) == 0);
        m_consumer = make(m_channel->name().string(), m_channel->storage());
        m_handler = new DiagDeviceHandler(fds[0], m_consumer, &m_ctrl, &m_ctrl.multiplexer());
        m_outcome = GOES_ON;
        m_consumer->set_callback(this, on_end);
        m_consumer->bind(m_handler);
        FUZZ_CHECK(m_handler->add_events(POLLIN) == 0 && m_consumer->start() == 0);
        for (const std::string& chunk : chunks) {
            FUZZ_CHECK(!chunk.empty() && chunk.size() <= DiagDeviceHandler::BUFFER_SIZE);
            FUZZ_CHECK(send(fds[1], chunk.data(), chunk.size(), 0) ==
                       static_cast<ssize_t>(chunk.size()));
            m_handler->process(POLLIN);
            if (m_outcome != GOES_ON) {
                break;
            }
        }
        end();
        close(fds[0]);
        close(fds[1]);
        take_file();
    }

    int outcome() const { return m_outcome; }  // a LogProcResult, or GOES_ON
    bool stored() const { return m_stored; }
    const std::string& content() const { return m_content; }  // of the stored file
    LogPipeHandler& channel() const { return *m_channel; }
    LogController& controller() { return m_ctrl; }

private:
    static void on_end(void* exchange, DataConsumer::LogProcResult result) {
        Exchange* self = static_cast<Exchange*>(exchange);
        FUZZ_CHECK(self->m_outcome == GOES_ON);
        self->m_outcome = result;
        self->end();
    }
    // As the channel does, which may be inside the handler's call.
    void end() {
        delete m_handler;
        delete m_consumer;
        m_handler = nullptr;
        m_consumer = nullptr;
    }

    // Removes what the consumer has left in the channel's directory, which a file made for
    // that tells.
    void take_file() {
        LogFile* own = m_channel->storage()->create_file("own", LT_UNKNOWN);
        FUZZ_CHECK(own && own->dir()->files().size() <= 2);
        CpDirectory& dir = *own->dir();
        m_stored = *dir.files().begin() != own;
        m_content.clear();
        if (m_stored) {
            std::ostringstream text;
            const std::string name = (*dir.files().begin())->name().string();
            text << std::ifstream(dir.path().string() + ("/" + name), std::ios::binary).rdbuf();
            m_content = text.str();
        }
        while (!dir.files().empty()) {
            FUZZ_CHECK(dir.remove_file(*dir.files().begin()) == 0);
        }
    }

    TestRoot m_root;
    FuzzFile m_settings;
    LogConfig m_config;
    LogController m_ctrl;
    LogPipeHandler* m_channel = nullptr;
    DiagDeviceHandler* m_handler = nullptr;
    DataConsumer* m_consumer = nullptr;
    int m_outcome = GOES_ON;
    bool m_stored = false;
    std::string m_content;
};

// A device's chunks from a text that people can read: a line is a chunk, in which M stands
// for the marker, m for all of it but its last byte and K for a kibibyte.
inline std::vector<std::string> fuzz_chunks(const std::string& text, const std::string& marker) {
    std::vector<std::string> chunks(1);
    for (char c : text) {
        if (c == '\n') {
            chunks.emplace_back();
            continue;
        }
        const std::string piece = c == 'M'   ? marker
                                  : c == 'm' ? marker.substr(0, marker.size() - 1)
                                  : c == 'K' ? std::string(1024, '.')
                                             : std::string(1, c);
        if (chunks.back().size() + piece.size() <= DiagDeviceHandler::BUFFER_SIZE) {
            chunks.back() += piece;
        }
    }
    std::vector<std::string> filled;
    for (const std::string& chunk : chunks) {
        if (!chunk.empty()) {
            filled.push_back(chunk);
        }
    }
    return filled;
}

#endif  // TESTS_FUZZ_EXCHANGE_H_
