// The modem's firmware image: what is found is what the format says, and each fault is the
// first one in the image.
#include "channels/ModemImage.h"

#include "fuzz/fuzz.h"

namespace {

typedef ModemImageFault Fault;

struct Found {
    Fault::Kind fault;
    std::string digest;
    std::string database;
};

uint64_t number_at(const std::string& image, size_t at) {
    uint64_t value = 0;
    for (size_t i = 4; i > 0; --i) {
        value = value << 8 | static_cast<uint8_t>(image[at + i - 1]);
    }
    return value;
}

Found payload_of(const std::string& image, size_t entry) {
    const uint64_t offset = number_at(image, entry + 4);
    const uint64_t size = number_at(image, entry + 8);
    if (!(image[entry + 1] & 0x04)) {
        return {Fault::NO_SHA1, "", ""};
    }
    if (offset + 20 > image.size()) {
        return {Fault::SHA1_CUT, "", ""};
    }
    if (size < 20 || offset + size > image.size()) {
        return {Fault::OUTSIDE, "", ""};
    }
    return {Fault::NONE, image.substr(offset, 20), image.substr(offset + 20, size - 20)};
}

Found look_up(const std::string& image) {
    if (image.size() < 24) {
        return {Fault::TOO_SHORT, "", ""};
    }
    if (image.compare(0, 4, "VHX1") != 0) {
        return {Fault::WRONG_MAGIC, "", ""};
    }
    for (size_t num = 0; num < 1024; ++num) {
        const size_t entry = 12 + 12 * num;
        if (entry + 12 > image.size()) {
            return {Fault::ENTRY_CUT, "", ""};
        }
        if (image[entry] == 2) {
            return payload_of(image, entry);
        }
        if (image[entry + 1] & 0x01) {
            return {Fault::NO_DATABASE, "", ""};
        }
    }
    return {Fault::TOO_MANY_ENTRIES, "", ""};
}

}  // namespace

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
    const Found expected = look_up(image);

    const int fd = open(file.path.c_str(), O_RDONLY | O_CLOEXEC);
    ModemImageDb db;
    FUZZ_CHECK(find_modem_image_db(fd, db).kind == expected.fault);
    const bool found = expected.fault == Fault::NONE;
    FUZZ_CHECK(!found || image.compare(db.offset, db.size, expected.database) == 0);
    close(fd);
    return 0;
}
