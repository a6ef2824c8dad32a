// The container of the modem's firmware image, as far as the log parsing database in it
// goes. All integers are little-endian. Nothing in an image is trusted.
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

#endif  // CHANNELS_MODEMIMAGE_H_
