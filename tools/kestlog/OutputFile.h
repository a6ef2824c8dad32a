// SPDX-License-Identifier: Apache-2.0
// A file that a command writes, or standard output for "-". It is written under a temporary name
// beside its own and gets its own when it is complete, so that no half file looks like a whole
// one. A file that exists is replaced only when asked for. What has not been closed is removed,
// also when a signal ends the program.
#ifndef KESTLOG_OUTPUTFILE_H_
#define KESTLOG_OUTPUTFILE_H_

#include <stddef.h>
#include <stdint.h>
#include <stdio.h>

#include <string>

class CommandLine;

// The stem with the suffix, as the name of a file: a long stem is cut to what a file system takes.
std::string output_name(const std::string& stem, const std::string& suffix);

// Whether the command may write what is no text to its --output, which a terminal is not made for.
// False after printing that, with the exit status in *status.
bool takes_binary(const CommandLine& line, int* status);

class OutputFile {
public:
    OutputFile() = default;
    ~OutputFile() { discard(); }
    OutputFile(const OutputFile&) = delete;
    OutputFile& operator=(const OutputFile&) = delete;

    // Has a file that the command reads, "-" for standard input, stay as it is, whatever is forced.
    // What has been written stays as well.
    static void keep(const std::string& path);

    // Each is false on failure; failed() then tells why. A FIFO or a device at path is written
    // to as it is; a link to a file is replaced, not followed.
    bool open(const std::string& path, bool force);
    bool write(const void* data, size_t len);
    // Copies up to limit bytes from where the descriptor stands; copied tells how many there
    // were. After a failed read it is true, with errno in *read_error.
    bool copy_from(int fd, uint64_t limit, uint64_t* copied, int* read_error);
    bool close();
    // Closes and removes the file.
    void discard();

    const std::string& path() const { return m_path; }
    FILE* stream() const { return m_file; }
    bool is_standard() const { return m_path == "-"; }
    // Prints what failed; returns ES_OUTPUT.
    int failed() const;

private:
    bool note_error(bool good);
    bool open_temporary();
    bool publish();
    void forget();

    // Called when a signal ends the program.
    static void remove_all(int signal);
    static void watch_signals();
    static OutputFile* s_first;  // of those that have a temporary name

    OutputFile* m_next = nullptr;
    std::string m_path;
    std::string m_temporary;  // "" for what is written to as it is
    FILE* m_file = nullptr;
    bool m_force = false;
    int m_error = 0;
};

#endif  // KESTLOG_OUTPUTFILE_H_
