// SPDX-License-Identifier: Apache-2.0
// A file that a command writes, or standard output for "-". A file that exists is replaced only
// when asked for. What has not been closed is removed, so that no half file looks like a whole.
#ifndef KESTLOG_OUTPUTFILE_H_
#define KESTLOG_OUTPUTFILE_H_

#include <stddef.h>
#include <stdio.h>

#include <string>

class OutputFile {
public:
    OutputFile() = default;
    ~OutputFile() { discard(); }
    OutputFile(const OutputFile&) = delete;
    OutputFile& operator=(const OutputFile&) = delete;

    // Each is false on failure; failed() then tells why.
    bool open(const std::string& path, bool force);
    bool write(const void* data, size_t len);
    bool close();
    // Closes and removes the file.
    void discard();

    const std::string& path() const { return m_path; }
    FILE* stream() const { return m_file; }
    // Prints what failed; returns ES_OUTPUT.
    int failed() const;

private:
    bool note_error(bool good);

    std::string m_path;
    FILE* m_file = nullptr;
    int m_error = 0;
};

#endif  // KESTLOG_OUTPUTFILE_H_
