// SPDX-License-Identifier: Apache-2.0
// A control client: every request that is not blank gets one reply line, in order, however
// the bytes are split; only a request that does not fit ends the connection; what was set
// is what the settings file says afterwards.
#include <poll.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/stat.h>

#include <algorithm>
#include <regex>
#include <sstream>
#include <vector>

#include "client/ClientHandler.h"
#include "client/ClientManager.h"
#include "control/LogController.h"
#include "fuzz/fuzz.h"
#include "support/TestRoot.h"

namespace {

struct Root : TestRoot {
    Root() {
        signal(SIGPIPE, SIG_IGN);  // as the service does
        for (const std::string name : {"log", "diag"}) {
            mkfifo(path(name).c_str(), 0600);
            set_prop("ro.modem.w." + name, path(name));
        }
        write_file("data/local/tmp/kest/kest.conf", "enable\nstream cp_wcdma on 0 0\n");
    }
    FuzzFile file{path("settings")};
};

bool is_reply(const std::string& line, const std::string& keyword) {
    static const std::regex PLAIN("OK|ERROR \\d");
    static const std::regex VALUE("OK (\\d+|ON|OFF|(EN|DIS)ABLE|(IN|EX)TERNAL)|ERROR \\d");
    for (const ControlRequest& request : CONTROL_REQUESTS) {
        if (keyword == request.keyword()) {
            const bool value = request.reply == RK_NUMBER || request.reply == RK_WORD;
            return std::regex_match(line, value ? VALUE : PLAIN);
        }
    }
    return line == "ERROR 1";
}

// The bytes that the service has read complete requests, taken off them, which are
// answered now. False when one that starts a transaction is to be answered later.
bool check_replies(int fd, std::string& bytes) {
    const size_t end = bytes.rfind('\n') + 1;
    std::istringstream requests(bytes.substr(0, end));
    bytes.erase(0, end);
    std::vector<std::string> keywords;
    bool saves = false;
    for (std::string line; std::getline(requests, line);) {
        const size_t start = line.find_first_not_of(" \t\r");
        if (start != std::string::npos) {
            keywords.push_back(line.substr(start, line.find_first_of(" \t\r", start) - start));
            saves = saves || keywords.back().compare(0, 5, "SAVE_") == 0;
        }
    }
    char buf[65536];
    const ssize_t n = recv(fd, buf, sizeof(buf), MSG_DONTWAIT);
    std::istringstream replies(std::string(buf, n > 0 ? static_cast<size_t>(n) : 0));
    size_t num = 0;
    for (std::string line; std::getline(replies, line); ++num) {
        FUZZ_CHECK(num < keywords.size() && !replies.eof());
        // In order, but the result of a transaction may come between other replies.
        FUZZ_CHECK(saves || is_reply(line, keywords[num]));
    }
    FUZZ_CHECK(num == keywords.size() || (saves && num == keywords.size() - 1));
    return num == keywords.size();
}

void run_client(LogController& ctrl, const std::string& text, size_t max_piece) {
    ClientManager manager(&ctrl, &ctrl.multiplexer(), 0);
    int fds[2];
    FUZZ_CHECK(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, fds) == 0);
    fcntl(fds[0], F_SETFL, O_NONBLOCK);
    ObjectRef<ClientHandler> handler(
        new ClientHandler(fds[0], &ctrl, &ctrl.multiplexer(), &manager));
    std::string held;  // read by the service, but not complete
    bool answered = true;
    size_t piece;
    for (size_t pos = 0; pos < text.size() && answered; pos += piece) {
        // As much as the service's buffer takes, or one byte too many.
        const size_t room = ClientHandler::MAX_REQUEST - held.size();
        piece = std::max<size_t>(std::min(max_piece, room), 1);
        held += text.substr(pos, piece);
        FUZZ_CHECK(write(fds[1], &text[pos], std::min(piece, text.size() - pos)) > 0);
        handler->process(POLLIN);
        FUZZ_CHECK((room == 0) == !handler);
        std::replace(held.begin(), held.end(), '\0', '\n');
        // A client that waits for an answer is not read from.
        answered = handler && check_replies(fds[1], held);
    }
    close(fds[1]);
    if (handler) {
        handler->process(POLLIN | POLLHUP);
        delete handler.get();  // when it had read a part only of what was sent
    }
}

}  // namespace

// The first byte tells how much is sent at a time.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const Root root;
    if (size < 1) {
        return 0;
    }
    root.file.write("stream cp_wcdma off 0 3\nstream cp_wcn off 0 3\nstream agdsp off 0 3\n");
    LogConfig config(root.file.path.c_str());
    LogController ctrl;
    FUZZ_CHECK(fuzz_read(config) == 0 && ctrl.init(&config) == 0);
    run_client(ctrl, fuzz_text(data + 1, size - 1), data[0] < 0x80 ? 512 : 1 + (data[0] & 0x7F));

    LogConfig saved(root.file.path.c_str());
    FUZZ_CHECK(fuzz_read(saved) == 0);
    FUZZ_CHECK(saved.log_file_size() == ctrl.get_log_file_size());
    FUZZ_CHECK(saved.sd_log_size() == ctrl.get_sd_size());
    FUZZ_CHECK(saved.save_md() == config.save_md() && saved.md_int_stor() == config.md_int_stor());
    for (CpType cp : {CT_WCDMA, CT_WCN, CT_AGDSP}) {
        FUZZ_CHECK(saved.find_stream(cp)->enable == config.find_stream(cp)->enable);
    }
    return 0;
}
