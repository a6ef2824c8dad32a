// SPDX-License-Identifier: Apache-2.0
// The SHA-1 digest: 20 bytes.
#ifndef SIM_SHA1_H_
#define SIM_SHA1_H_

#include <stddef.h>
#include <stdint.h>

#include <string>
#include <vector>

std::vector<uint8_t> sha1(const uint8_t* data, size_t len);
// As it is written for people: 40 upper-case hexadecimal digits.
std::string digest_text(const std::vector<uint8_t>& digest);

#endif  // SIM_SHA1_H_
