// SPDX-License-Identifier: Apache-2.0

#include "channels/ModemImage.h"

#include <string.h>
#include <unistd.h>

namespace {

typedef ModemImageFault Fault;

// Reads up to the entry of the database.
Fault find_entry(int fd, ModemImageEntry& entry) {
    struct {
        ModemImageHeader header;
        ModemImageEntry entry;
    } head;
    static_assert(sizeof(head) == sizeof(ModemImageHeader) + sizeof(ModemImageEntry), "packed");
    if (read(fd, &head, sizeof(head)) != static_cast<ssize_t>(sizeof(head))) {
        return {Fault::TOO_SHORT};
    }
    if (memcmp(head.header.magic, MODEM_IMAGE_MAGIC, sizeof(head.header.magic)) != 0) {
        return {Fault::WRONG_MAGIC};
    }
    entry = head.entry;
    for (int num = 1; entry.type != MODEM_IMAGE_PARSING_DB; ++num) {
        if (entry.flags & MODEM_IMAGE_LAST_ENTRY) {
            return {Fault::NO_DATABASE};
        }
        if (num == MODEM_IMAGE_MAX_ENTRIES) {
            return {Fault::TOO_MANY_ENTRIES, MODEM_IMAGE_MAX_ENTRIES};
        }
        const ssize_t n = read(fd, &entry, sizeof(entry));
        if (n != static_cast<ssize_t>(sizeof(entry))) {
            return {Fault::ENTRY_CUT, n};
        }
    }
    return {};
}

}  // namespace

ModemImageFault find_modem_image_db(int fd, ModemImageDb& db) {
    // A block device has a length too, but only lseek tells it.
    const off_t image_len = lseek(fd, 0, SEEK_END);
    lseek(fd, 0, SEEK_SET);
    ModemImageEntry entry;
    const Fault fault = find_entry(fd, entry);
    if (fault.kind != Fault::NONE) {
        return fault;
    }
    if (!(entry.flags & MODEM_IMAGE_HAS_SHA1)) {
        return {Fault::NO_SHA1};
    }
    if (lseek(fd, static_cast<off_t>(entry.offset), SEEK_SET) != static_cast<off_t>(entry.offset)) {
        return {Fault::SEEK_FAILED};
    }
    const ssize_t n = read(fd, db.sha1, sizeof(db.sha1));
    if (n != static_cast<ssize_t>(sizeof(db.sha1))) {
        return {Fault::SHA1_CUT, n};
    }
    const uint64_t end = static_cast<uint64_t>(entry.offset) + entry.size;
    if (entry.size < SHA1_LEN || image_len < 0 || end > static_cast<uint64_t>(image_len) ||
        end > SIZE_MAX) {
        return {Fault::OUTSIDE, entry.offset, entry.size};
    }
    db.offset = static_cast<size_t>(entry.offset) + SHA1_LEN;
    db.size = entry.size - SHA1_LEN;
    return {};
}
