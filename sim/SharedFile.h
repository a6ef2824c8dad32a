// SPDX-License-Identifier: Apache-2.0
// A file of fixed size that is mapped for as long as the object lives; sparse, so that it
// takes the room of what was written to it only.
#ifndef SIM_SHAREDFILE_H_
#define SIM_SHAREDFILE_H_

#include <stddef.h>
#include <stdint.h>

#include <string>

class SharedFile {
public:
    SharedFile() = default;
    ~SharedFile() { remove(); }
    SharedFile(const SharedFile&) = delete;
    SharedFile& operator=(const SharedFile&) = delete;

    // Makes the file, all zeros, and maps it; false with errno set on failure.
    bool create(const std::string& path, size_t size);
    // Unmaps and deletes it.
    void remove();

    uint8_t* data() const { return m_data; }  // null while there is none

private:
    std::string m_path;
    uint8_t* m_data = nullptr;
    size_t m_size = 0;
};

#endif  // SIM_SHAREDFILE_H_
