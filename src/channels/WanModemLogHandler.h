// SPDX-License-Identifier: Apache-2.0
// The log channel of a cellular modem in one of its radio modes. Owned by the LogController.
#ifndef CHANNELS_WANMODEMLOGHANDLER_H_
#define CHANNELS_WANMODEMLOGHANDLER_H_

#include "channels/LogPipeHandler.h"
#include "storage/MediaType.h"

class MediaStorage;

class WanModemLogHandler : public LogPipeHandler {
public:
    // mem_path: the kernel file with the modem's memory, as fixed for its type.
    WanModemLogHandler(LogController* ctrl, Multiplexer* mux, const LogConfig::ConfigEntry* entry,
                       StorageManager* stor_mgr, const char* mem_path);
    ~WanModemLogHandler() override;

    int start() override;
    int stop() override;
    int start_dump(const struct tm& t) override;

    static void diag_transaction_notify(void* client, DataConsumer::LogProcResult result);

    // ---- The log parsing database beside the logs. 0 or -1; every failure is logged and
    // leaves no half-written file. sha1_hex: SHA1_HEX_LEN characters, no terminator.

    // Path of the modem's firmware image, from the properties; cut when it does not fit.
    static int get_image_path(CpType type, char* buf, size_t size);
    // A descriptor, or -1. A path that was cut is not opened.
    static int open_modem_img();
    // Finds the database in the image: its digest, its place and its size in bytes.
    static int get_modem_img(int fd, uint8_t* sha1_hex, size_t& offset, size_t& size);
    // What is saved on the medium: its digest and its size.
    static int check_cur_parsing_lib(const android::String8& db_path,
                                     const android::String8& sha1_path, uint8_t* sha1_hex,
                                     size_t& size);
    // Writes the database that lies in fd, and its digest. The digest goes first and comes
    // last: wherever this ends, what counts as current is complete.
    static int save_log_lib(const android::String8& db_path, const android::String8& sha1_path,
                            int fd, size_t offset, size_t size, const uint8_t* sha1_hex);
    // Brings the files in the medium's log root up to date.
    int save_log_parsing_lib(MediaStorage& media);
    static void on_media_change(void* handler, MediaType type);

private:
    void save_current_parsing_lib();
    void unsubscribe();

    android::String8 m_mem_path;
    bool m_subscribed = false;  // to changes of the medium
};

#endif  // CHANNELS_WANMODEMLOGHANDLER_H_
