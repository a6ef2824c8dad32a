// SPDX-License-Identifier: Apache-2.0

#include "sim/SimModemImage.h"

#include <string.h>
#include <unistd.h>

#include <filesystem>

#include "sim/SimHandset.h"
#include "sim/files.h"
#include "sim/sha1.h"

namespace {

const size_t HEADER_SIZE = 12;
const size_t ENTRY_SIZE = 12;
const size_t OTHER_PAYLOAD = 1000;

const uint8_t TYPE_FIRMWARE = 1;
const uint8_t TYPE_DATABASE = 2;
const uint8_t TYPE_OTHER = 3;
const uint8_t FLAG_LAST = 0x01;
const uint8_t FLAG_DIGEST = 0x04;

void put32(std::vector<uint8_t>& bytes, size_t value) {
    for (int shift = 0; shift < 32; shift += 8) {
        bytes.push_back(static_cast<uint8_t>(value >> shift));
    }
}

void put_entry(std::vector<uint8_t>& bytes, uint8_t type, uint8_t flags, size_t offset,
               size_t size) {
    bytes.insert(bytes.end(), {type, flags, 0xEE, 0xEE});
    put32(bytes, offset);
    put32(bytes, size);
}

}  // namespace

SimModemImage::SimModemImage(size_t database_size, uint32_t seed, unsigned other_entries)
    : m_database(database_size), m_other_entries(other_entries) {
    uint32_t x = seed * 2654435761u + 1;
    for (uint8_t& byte : m_database) {
        x = x * 1664525 + 1013904223;
        byte = static_cast<uint8_t>(x >> 24);
    }
    m_digest = sha1(m_database.data(), m_database.size());
    m_digest_text = ::digest_text(m_digest);
}

std::vector<uint8_t> SimModemImage::bytes() const {
    std::vector<uint8_t> image = {'V', 'H', 'X', '1', 1, 0, 0, 0, 0x5A, 0x5A, 0x5A, 0x5A};
    // The database is the last but one entry, if there are others.
    size_t offset = HEADER_SIZE + (1 + m_other_entries) * ENTRY_SIZE;
    for (unsigned i = 0; i + 1 < m_other_entries; ++i) {
        put_entry(image, TYPE_FIRMWARE, 0, offset, OTHER_PAYLOAD);
        offset += OTHER_PAYLOAD;
    }
    const size_t database_size = m_digest.size() + m_database.size();
    const bool last = m_other_entries == 0;
    put_entry(image, TYPE_DATABASE, static_cast<uint8_t>(FLAG_DIGEST | (last ? FLAG_LAST : 0)),
              offset, database_size);
    if (!last) {
        put_entry(image, TYPE_OTHER, FLAG_LAST, offset + database_size, OTHER_PAYLOAD);
    }
    image.resize(offset, 0xF1);
    image.insert(image.end(), m_digest.begin(), m_digest.end());
    image.insert(image.end(), m_database.begin(), m_database.end());
    if (!last) {
        image.resize(image.size() + OTHER_PAYLOAD, 0xF2);
    }
    return image;
}

bool SimModemImage::install(SimHandset& handset, const std::string& mode) const {
    const std::string partitions = handset.path("dev/block/");
    std::error_code ec;
    std::filesystem::create_directories(partitions, ec);
    const std::string path = partitions + mode + "_modem";
    const std::string temp = path + ".new";
    const std::vector<uint8_t> image = bytes();
    FILE* f = fopen(temp.c_str(), "we");
    if (!f) {
        return false;
    }
    const bool written = fwrite(image.data(), 1, image.size(), f) == image.size();
    return fclose(f) == 0 && written && rename(temp.c_str(), path.c_str()) == 0 &&
           handset.set_prop("ro.product.partitionpath", partitions) &&
           handset.set_prop("persist.modem." + mode + ".nvp", mode + "_");
}

bool SimModemImage::saved_in(const std::string& log_root) const {
    const std::string saved = read_text_file(log_root + "/modem_db.gz");
    return saved.size() == m_database.size() &&
           memcmp(saved.data(), m_database.data(), saved.size()) == 0 &&
           read_text_file(log_root + "/sha1.txt") == m_digest_text;
}
