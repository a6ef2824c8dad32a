// The time service: a reply of 12 bytes or more gives the record, in the form that kestlog
// reads, any other one line in the log and nothing in the file.
#include <cutils/sockets.h>

#include "channels/TimeSyncRecord.h"
#include "fuzz/Exchange.h"
#include "fuzz/scan.h"

namespace {

constexpr char LOG_NAME[] = "0-cp_wcdma-2016-03-01_09-15-00.log";

std::string g_reply;

struct Service {
    Exchange exchange{CT_WCDMA};
    const int server =
        socket_local_server("cp_time_sync_server", ANDROID_SOCKET_NAMESPACE_ABSTRACT, SOCK_STREAM);
};

Service& service() {
    static Service the_service;
    return the_service;
}

}  // namespace

// The service answers when the channel begins to wait: nothing depends on how fast it is.
extern "C" int __real_poll(struct pollfd* fds, nfds_t num, int timeout_ms);
extern "C" int __wrap_poll(struct pollfd* fds, nfds_t num, int timeout_ms) {
    const int conn = accept4(service().server, nullptr, nullptr, SOCK_CLOEXEC);
    FUZZ_CHECK(conn >= 0 && send(conn, g_reply.data(), g_reply.size(), 0) ==
                                static_cast<ssize_t>(g_reply.size()));
    close(conn);
    return __real_poll(fds, num, timeout_ms);
}

namespace {

uint32_t number_at(const std::string& text, size_t at) {
    uint32_t value = 0;
    for (size_t i = 4; i > 0; --i) {
        value = value << 8 | static_cast<uint8_t>(text[at + i - 1]);
    }
    return value;
}

// What the channel writes at the start of a log file.
std::string head_of_file(bool& written) {
    LogFile* file = service().exchange.channel().storage()->create_file(LOG_NAME, LT_LOG);
    FUZZ_CHECK(file);
    written = service().exchange.channel().save_timestamp(file);
    FUZZ_CHECK(file->write_out() == 0);
    char head[64];
    const ssize_t n = pread(file->fd(), head, sizeof(head), 0);
    FUZZ_CHECK(n >= 0 && file->dir()->remove_file(file) == 0);
    return std::string(head, static_cast<size_t>(n));
}

}  // namespace

// The first byte tells the zone.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    service();
    if (size < 1) {
        return 0;
    }
    const int zone = data[0] % 23 - 11;
    setenv("TZ", ("XXX" + std::to_string(-zone)).c_str(), 1);
    tzset();
    g_reply = fuzz_text(data + 1, size - 1);

    LogCapture log;
    bool written = false;
    const std::string head = head_of_file(written);
    FUZZ_CHECK(written == (g_reply.size() >= 12));
    FUZZ_CHECK(log.count("save_timestamp(LogFile*): can not read time info [") == !written);
    const Scanned scan = fuzz_scan(LOG_NAME, head);
    FUZZ_CHECK(scan.report.has_record == written);
    if (written) {
        const TimeSyncRecord& record = scan.report.record;
        FUZZ_CHECK(head.size() == 16 && number_at(head, 0) == 0x12345678);
        FUZZ_CHECK(record.seconds == number_at(g_reply, 0) + 3600u * static_cast<uint32_t>(zone));
        FUZZ_CHECK(fuzz_text(record.cp_time, 8) == g_reply.substr(4, 8));
    } else {
        FUZZ_CHECK(head.empty());
    }
    return 0;
}
