// SPDX-License-Identifier: Apache-2.0
// What a CP has logged, read from its directory.
#ifndef SIM_LOGGED_BYTES_H_
#define SIM_LOGGED_BYTES_H_

#include <string>
#include <vector>

// The bytes of each log file, the oldest first, as the CP sent them: without time records and,
// for an audio DSP, only its log's, without chunk headers, all in one.
std::vector<std::string> logged_bytes(const std::string& cp_dir);

#endif  // SIM_LOGGED_BYTES_H_
