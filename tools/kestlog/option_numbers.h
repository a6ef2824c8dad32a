// SPDX-License-Identifier: Apache-2.0
// The numbers and words that options of kestlog take. Each function leaves the value as it is when
// the option is not given and otherwise needs one within the limits; it is false, with the exit
// status in *status, after printing what is wrong.
#ifndef KESTLOG_OPTION_NUMBERS_H_
#define KESTLOG_OPTION_NUMBERS_H_

#include <stdint.h>

#include "common/CommandLine.h"

// A whole number, decimal or, after "0x", hexadecimal.
bool read_whole(const CommandLine& line, const char* option, uint64_t least, uint64_t most,
                uint64_t* value, int* status);

// The type or sub-type of frames.
bool read_type(const CommandLine& line, const char* option, int* value, int* status);

// A frequency or, with positive, a rate: it may have a fraction and an exponent.
bool read_hertz(const CommandLine& line, const char* option, bool positive, double* value,
                int* status);

// One of the words; false also when the option is not given.
bool check_word(const CommandLine& line, const char* option, const Args& words, int* status);

#endif  // KESTLOG_OPTION_NUMBERS_H_
