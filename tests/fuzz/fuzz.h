// SPDX-License-Identifier: Apache-2.0
// A fuzz target is one LLVMFuzzerTestOneInput that checks properties with FUZZ_CHECK and
// leaves nothing behind, so that every input can be replayed alone.
#ifndef TESTS_FUZZ_FUZZ_H_
#define TESTS_FUZZ_FUZZ_H_

#include <fcntl.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/mman.h>
#include <unistd.h>

#include <fstream>
#include <string>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size);

// Standard error as it was at the start: the service's log may be sent elsewhere.
inline const int fuzz_report_fd = fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 3);

#define FUZZ_CHECK(condition)                                                                 \
    do {                                                                                      \
        if (!(condition)) {                                                                   \
            dprintf(fuzz_report_fd, "%s:%d: not true: %s\n", __FILE__, __LINE__, #condition); \
            abort();                                                                          \
        }                                                                                     \
    } while (0)

inline std::string fuzz_text(const uint8_t* data, size_t size) {
    return std::string(reinterpret_cast<const char*>(data), size);
}

template <typename Config>
int fuzz_read(Config& config) {
    char name[] = "kestmodem";
    char* argv[] = {name, nullptr};
    return config.read_config(1, argv);
}

// In memory, as every input writes it again. That is a link; what must be none names its path.
struct FuzzFile {
    void write(const std::string& text) const { std::ofstream(path, std::ios::binary) << text; }
    const std::string path = "/proc/self/fd/" + std::to_string(memfd_create("fuzz", MFD_CLOEXEC));
};

#endif  // TESTS_FUZZ_FUZZ_H_
