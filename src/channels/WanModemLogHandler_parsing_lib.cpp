// SPDX-License-Identifier: Apache-2.0
// The part of WanModemLogHandler that keeps the modem's log parsing database beside its
// logs: taken from the firmware image, with the digest that tells whether it is current.
#include <cutils/properties.h>
#include <errno.h>
#include <fcntl.h>
#include <stdint.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>

#include "channels/ModemImage.h"
#include "channels/WanModemLogHandler.h"
#include "config/property_names.h"
#include "core/copy_bytes.h"
#include "core/log.h"
#include "core/open_file.h"
#include "storage/CpStorage.h"
#include "storage/MediaStorage.h"

namespace {

constexpr char DB_FILE_NAME[] = "/modem_db.gz";
constexpr char SHA1_FILE_NAME[] = "/sha1.txt";
constexpr size_t IMAGE_PATH_SIZE = 128;
constexpr size_t COPY_SIZE = 32768;

// What is said of a fault; the formats take its two numbers. Nothing is said of an image
// that merely has no database.
struct FaultMessage {
    ModemImageFault::Kind kind;
    const char* format;
};
constexpr FaultMessage FAULT_MESSAGES[] = {
    {ModemImageFault::TOO_SHORT, "MODEM image length less than two headers"},
    {ModemImageFault::WRONG_MAGIC, "MODEM image not VHX1 format"},
    {ModemImageFault::TOO_MANY_ENTRIES, "MODEM image has more than %lld headers"},
    {ModemImageFault::ENTRY_CUT, "can not read more headers %lld"},
    {ModemImageFault::NO_SHA1, "MODEM image has no SHA-1 checksum"},
    {ModemImageFault::SEEK_FAILED, "lseek MODEM image error"},
    {ModemImageFault::SHA1_CUT, "read SHA-1 error %lld"},
    {ModemImageFault::OUTSIDE, "MODEM image entry at %lld size %lld is not within the image"},
};

// 0 when nothing has the name any more. A directory stays and is a failure.
int remove_file(const char* path) {
    return unlink(path) == 0 || errno == ENOENT ? 0 : -1;
}

// Makes a file that is new: whatever else had the name, a link or a FIFO put there by
// somebody else included, is not written to but replaced.
int create_anew(const char* path) {
    return remove_file(path) < 0 ? -1
                                 : open_to_write(path, O_WRONLY | O_CREAT | O_EXCL, Links::REFUSE);
}

}  // namespace

int WanModemLogHandler::get_image_path(CpType type, char* buf, size_t size) {
    char partition[PROPERTY_VALUE_MAX];
    property_get(PROP_PARTITION_PATH, partition, "");
    if (!partition[0]) {
        err_log("no ro.product.partitionpath property");
        return -1;
    }
    char prop[32];
    snprintf(prop, sizeof(prop), "%s%s", PROP_MODEM_PREFIX, cp_image_prop_suffix(type));
    char value[PROPERTY_VALUE_MAX];
    property_get(prop, value, "");
    if (!value[0]) {
        err_log("no %s property", prop);
        return -1;
    }
    snprintf(buf, size, "%s%smodem", partition, value);
    return 0;
}

int WanModemLogHandler::open_modem_img() {
    const CpType type = LogConfig::wan_modem_type();
    if (type == CT_UNKNOWN) {
        err_log("can not get MODEM type");
        return -1;
    }
    char path[IMAGE_PATH_SIZE + 1];  // one more than a path may fill, to know one that was cut
    if (get_image_path(type, path, sizeof(path)) < 0) {
        err_log("can not get MODEM image file path");
        return -1;
    }
    if (strlen(path) >= IMAGE_PATH_SIZE) {
        // Cut short it could name another file.
        errno = ENAMETOOLONG;
        err_log("MODEM image path %s... is too long", path);
        return -1;
    }
    return open_to_read(path, Links::FOLLOW);
}

int WanModemLogHandler::get_modem_img(int fd, uint8_t* sha1_hex, size_t& offset, size_t& size) {
    ModemImageDb db;
    const ModemImageFault fault = find_modem_image_db(fd, db);
    if (fault.kind != ModemImageFault::NONE) {
        for (const FaultMessage& message : FAULT_MESSAGES) {
            if (message.kind == fault.kind) {
                char text[96];
                snprintf(text, sizeof(text), message.format, fault.number, fault.size);
                err_log("%s", text);
            }
        }
        return -1;
    }
    offset = db.offset;
    size = db.size;
    static const char DIGITS[] = "0123456789ABCDEF";
    for (size_t i = 0; i < SHA1_LEN; ++i) {
        sha1_hex[2 * i] = static_cast<uint8_t>(DIGITS[db.sha1[i] >> 4]);
        sha1_hex[2 * i + 1] = static_cast<uint8_t>(DIGITS[db.sha1[i] & 0x0F]);
    }
    return 0;
}

int WanModemLogHandler::check_cur_parsing_lib(const android::String8& db_path,
                                              const android::String8& sha1_path, uint8_t* sha1_hex,
                                              size_t& size) {
    struct stat st;
    if (lstat(db_path.string(), &st) < 0) {
        err_log("lstat(%s) error", db_path.string());
        return -1;
    }
    if (!S_ISREG(st.st_mode)) {
        errno = S_ISDIR(st.st_mode) ? EISDIR : EINVAL;
        err_log("%s is not a regular file", db_path.string());
        return -1;
    }
    const int fd = open_to_read(sha1_path.string(), Links::REFUSE);
    if (fd < 0) {
        err_log("open(%s) error", sha1_path.string());
        return -1;
    }
    const ssize_t n = read(fd, sha1_hex, SHA1_HEX_LEN);
    ::close(fd);
    if (n != static_cast<ssize_t>(SHA1_HEX_LEN)) {
        err_log("read SHA-1 file error: %d", static_cast<int>(n));
        return -1;
    }
    // A length that size cannot tell must not become that of a database.
    size = static_cast<size_t>(std::min<uint64_t>(static_cast<uint64_t>(st.st_size), SIZE_MAX));
    return 0;
}

int WanModemLogHandler::save_log_lib(const android::String8& db_path,
                                     const android::String8& sha1_path, int fd, size_t offset,
                                     size_t size, const uint8_t* sha1_hex) {
    if (lseek(fd, static_cast<off_t>(offset), SEEK_SET) != static_cast<off_t>(offset)) {
        err_log("seek MODEM image file %u error", static_cast<unsigned int>(offset));
        return -1;
    }
    if (remove_file(sha1_path.string()) < 0) {
        err_log("remove %s failed", sha1_path.string());
        return -1;
    }
    const int db = create_anew(db_path.string());
    if (db < 0) {
        err_log("open %s failed", db_path.string());
        return -1;
    }
    // An image that ends early is copied without an error, but is not the whole database.
    static uint8_t buffer[COPY_SIZE];
    uint64_t done;
    const bool copied = copy_bytes(fd, db, buffer, sizeof(buffer), size, done) == 0 && done == size;
    // What the medium could not take may come out only now.
    const int closed = ::close(db);
    if (!copied || closed < 0) {
        err_log("save parsing lib error");
        unlink(db_path.string());
        return -1;
    }
    const int sha1 = create_anew(sha1_path.string());
    if (sha1 < 0) {
        err_log("create SHA-1 file error");
        unlink(db_path.string());
        return -1;
    }
    const ssize_t n = write(sha1, sha1_hex, SHA1_HEX_LEN);
    const int sha1_closed = ::close(sha1);
    if (n != static_cast<ssize_t>(SHA1_HEX_LEN) || sha1_closed < 0) {
        err_log("write SHA-1 file error %d", static_cast<int>(n));
        unlink(sha1_path.string());
        unlink(db_path.string());
        return -1;
    }
    return 0;
}

int WanModemLogHandler::save_log_parsing_lib(MediaStorage& media) {
    android::String8 db_path(media.log_root());
    db_path.append(DB_FILE_NAME);
    android::String8 sha1_path(media.log_root());
    sha1_path.append(SHA1_FILE_NAME);

    uint8_t saved_sha1[SHA1_HEX_LEN];
    size_t saved_size = 0;
    const bool saved = check_cur_parsing_lib(db_path, sha1_path, saved_sha1, saved_size) == 0;
    const int fd = open_modem_img();
    if (fd < 0) {
        err_log("open MODEM image failed");
        return -1;
    }
    uint8_t sha1[SHA1_HEX_LEN];
    size_t offset = 0;
    size_t size = 0;
    if (get_modem_img(fd, sha1, offset, size) < 0) {
        ::close(fd);
        err_log("get MODEM image info error");
        return -1;
    }
    int result = 0;
    if (!saved || saved_size != size || memcmp(saved_sha1, sha1, SHA1_HEX_LEN) != 0) {
        result = save_log_lib(db_path, sha1_path, fd, offset, size, sha1);
    }
    ::close(fd);
    return result;
}

void WanModemLogHandler::save_current_parsing_lib() {
    MediaStorage* media = stor_mgr()->get_media_stor();
    if (media && !media->leads_away()) {
        save_log_parsing_lib(*media);
    }
}

void WanModemLogHandler::on_media_change(void* handler, MediaType /*type*/) {
    static_cast<WanModemLogHandler*>(handler)->save_current_parsing_lib();
}
