// SPDX-License-Identifier: Apache-2.0
// Whole files, and directories for a while.
#ifndef SIM_FILES_H_
#define SIM_FILES_H_

#include <stdint.h>

#include <string>

// What the file holds; "" when it cannot be read.
std::string read_text_file(const std::string& path);

// Where directories for a while are made: $TMPDIR or /tmp, as an absolute path.
std::string temp_dir();
// Whether so many bytes are free where a directory is or is to be made; "" is for a new one in
// temp_dir(). What else is wrong with the place shows when the directory is made. False with
// *problem, a line for people.
bool has_room(const std::string& dir, uint64_t needed, std::string* problem);
// Makes a directory "prefix.XXXXXX" below the parent. Its path; "" with errno set on failure.
std::string make_temp_dir(const std::string& parent, const std::string& prefix);
// Removes the directory with everything below it. False if something of it is left.
bool remove_dir(const std::string& path);

// Such a directory as long as the object lives.
class TempDir {
public:
    TempDir(const std::string& parent, const std::string& prefix)
        : m_path(make_temp_dir(parent, prefix)) {}
    ~TempDir() { remove_dir(m_path); }
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;

    const std::string& path() const { return m_path; }  // "" when it could not be made

private:
    const std::string m_path;
};

#endif  // SIM_FILES_H_
