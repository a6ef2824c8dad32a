// SPDX-License-Identifier: Apache-2.0
// The modem's firmware image: whatever it holds, a database that is found lies in the image
// behind its digest, and the table of entries is read no further than it may be.
#include "channels/ModemImage.h"

#include <string.h>

#include "fuzz/fuzz.h"

// A first byte from 0x80 on tells how often, in sixteens, the first entry is repeated.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const FuzzFile file;
    if (size < 1) {
        return 0;
    }
    std::string image = fuzz_text(data + 1, size - 1);
    if (image.size() >= 24 && data[0] >= 0x80) {
        const std::string entry = image.substr(12, 12);
        for (int i = 0; i < 16 * (data[0] - 0x7f); ++i) {
            image.insert(12, entry);
        }
    }
    file.write(image);

    const int fd = open(file.path.c_str(), O_RDONLY | O_CLOEXEC);
    ModemImageDb db;
    const ModemImageFault fault = find_modem_image_db(fd, db);
    const off_t read_to = lseek(fd, 0, SEEK_CUR);
    close(fd);
    const bool has_magic = image.compare(0, 4, "VHX1") == 0;
    FUZZ_CHECK((fault.kind == ModemImageFault::TOO_SHORT) == (image.size() < 24));
    FUZZ_CHECK(image.size() < 24 || (fault.kind == ModemImageFault::WRONG_MAGIC) == !has_magic);
    if (fault.kind == ModemImageFault::NONE) {
        FUZZ_CHECK(db.offset >= 20 && db.offset + db.size <= image.size());
        FUZZ_CHECK(memcmp(db.sha1, image.data() + db.offset - 20, 20) == 0);
    } else if (fault.kind == ModemImageFault::TOO_MANY_ENTRIES) {
        FUZZ_CHECK(read_to <= 12 + 12 * 1025);
    }
    return 0;
}
