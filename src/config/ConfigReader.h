// SPDX-License-Identifier: Apache-2.0
// Reads a configuration file line by line. Owned by the reader of one file, on its stack;
// closes the file in the end.
//
// The file may be anything that somebody put in its place: nothing but a file with an end is
// opened, no link is followed, and a read error is told apart from that end.
#ifndef CONFIG_CONFIGREADER_H_
#define CONFIG_CONFIGREADER_H_

#include <stdio.h>

#include "config/config_text.h"

class ConfigReader {
public:
    ConfigReader() = default;
    ~ConfigReader();
    ConfigReader(const ConfigReader&) = delete;
    ConfigReader& operator=(const ConfigReader&) = delete;

    // Opens the file at path, used as given. 0, or -1 with errno: EFBIG above 1 MiB.
    int open(const char* path);

    // The next line, valid until the next call. Null at the end and, with errno, after a read error
    // or beyond 1 MiB.
    const char* next_line();

    int line_number() const { return m_number; }  // of the last line, from 1
    bool failed() const { return m_too_large || ferror(m_file) != 0; }

private:
    FILE* m_file = nullptr;
    int m_number = 0;
    bool m_too_large = false;
    char m_line[CONFIG_LINE_SIZE];
};

#endif  // CONFIG_CONFIGREADER_H_
