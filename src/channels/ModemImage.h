// SPDX-License-Identifier: Apache-2.0
// The container of the modem's firmware image, as far as the log parsing database in it
// goes. All integers are little-endian. Nothing in an image is trusted: the parser logs
// nothing and says what is wrong, the channel that asked turns that into a message.
#ifndef CHANNELS_MODEMIMAGE_H_
#define CHANNELS_MODEMIMAGE_H_

#include <stddef.h>
#include <stdint.h>

constexpr char MODEM_IMAGE_MAGIC[] = "VHX1";  // the first four bytes

struct ModemImageHeader {
    char magic[4];
    uint8_t reserved[8];
};
static_assert(sizeof(ModemImageHeader) == 12, "12 bytes in the image");

struct ModemImageEntry {
    uint8_t type;
    uint8_t flags;
    uint8_t reserved[2];
    uint32_t offset;  // of the payload, from the start of the image
    uint32_t size;    // of the payload, digest included
};
static_assert(sizeof(ModemImageEntry) == 12, "12 bytes in the image");

constexpr uint8_t MODEM_IMAGE_PARSING_DB = 2;     // entry type of the parsing database
constexpr uint8_t MODEM_IMAGE_LAST_ENTRY = 0x01;  // flag
constexpr uint8_t MODEM_IMAGE_HAS_SHA1 = 0x04;    // flag: the payload begins with a digest
constexpr size_t SHA1_LEN = 20;
constexpr size_t SHA1_HEX_LEN = 2 * SHA1_LEN;
// An image has a handful of entries; a table that goes on for longer is garbage.
constexpr int MODEM_IMAGE_MAX_ENTRIES = 1024;

// Where the parsing database lies. Offset and size are bytes, without the digest, and within
// the image.
struct ModemImageDb {
    uint8_t sha1[SHA1_LEN];
    size_t offset;
    size_t size;
};

// Why there is no database, with the numbers that tell more.
struct ModemImageFault {
    enum Kind {
        NONE,
        TOO_SHORT,  // for the header and an entry
        WRONG_MAGIC,
        NO_DATABASE,       // the table ends without one
        TOO_MANY_ENTRIES,  // number: the limit
        ENTRY_CUT,         // number: bytes read, or -1
        NO_SHA1,
        SEEK_FAILED,  // to the payload
        SHA1_CUT,     // number: bytes read, or -1
        OUTSIDE       // number, size: offset and size of the payload
    };
    Kind kind = NONE;
    long long number = 0;
    long long size = 0;
};

// Finds the database in the image, which may be a file or a block device; db is set when
// the fault is NONE. errno is that of the last call that failed. Moves the file position.
ModemImageFault find_modem_image_db(int fd, ModemImageDb& db);

#endif  // CHANNELS_MODEMIMAGE_H_
