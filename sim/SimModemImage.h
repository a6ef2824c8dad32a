// SPDX-License-Identifier: Apache-2.0
// The modem's firmware image, as far as others read it: a header, entries, and among them
// the database that the modem's logs are decoded with, behind its SHA-1 digest.
#ifndef SIM_SIMMODEMIMAGE_H_
#define SIM_SIMMODEMIMAGE_H_

#include <stddef.h>
#include <stdint.h>

#include <string>
#include <vector>

class SimHandset;

class SimModemImage {
public:
    // The database is made from the seed. In front of its entry stand some others.
    SimModemImage(size_t database_size, uint32_t seed, unsigned other_entries = 2);

    const std::vector<uint8_t>& database() const { return m_database; }
    // The digest as it is written for people: 40 upper-case hexadecimal digits.
    const std::string& digest_text() const { return m_digest_text; }
    std::vector<uint8_t> bytes() const;

    // Puts the image in the place of the partition of the modem of this radio mode ("w",
    // "t", "tl", "lf", "l") and announces it by the handset's properties. False with errno
    // set on failure.
    bool install(SimHandset& handset, const std::string& mode) const;
    // Whether the log root holds the database and its digest, and nothing else of them.
    bool saved_in(const std::string& log_root) const;

private:
    std::vector<uint8_t> m_database;
    std::vector<uint8_t> m_digest;
    std::string m_digest_text;
    unsigned m_other_entries;
};

#endif  // SIM_SIMMODEMIMAGE_H_
