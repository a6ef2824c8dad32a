// SPDX-License-Identifier: Apache-2.0

#include "sim/kernel_files.h"

#include <errno.h>
#include <stdio.h>

#include <filesystem>

#include "sim/SimStream.h"

namespace fs = std::filesystem;

std::vector<uint8_t> kernel_file_content(const std::string& name, size_t size) {
    std::vector<uint8_t> data(size);
    uint32_t seed = 0;
    for (const char c : name) {
        seed = seed * 31 + static_cast<uint8_t>(c);
    }
    if (name.compare(0, 5, "proc/") == 0) {
        SimStream(0xee, seed).fill(0, data.data(), size);
        return data;
    }
    const std::string record = name.substr(name.rfind('/') + 1);
    char line[80];
    for (size_t at = 0, number = 0; at < size; ++number) {
        const int n = snprintf(line, sizeof line, "%s %06zu channel %zu value %08zx\n",
                               record.c_str(), number, number % 7, (number + 1) * 2654435761u);
        for (int i = 0; i < n && at < size; ++i) {
            data[at++] = static_cast<uint8_t>(line[i]);
        }
    }
    return data;
}

bool make_kernel_files(const std::string& root, const KernelFileSizes& sizes) {
    const struct {
        const char* name;
        size_t size;
    } files[] = {
        {"proc/cpw/mem", sizes.memory},      {"proc/cpw/mini_dump", sizes.mini_dump},
        {"proc/cpt/mem", sizes.memory},      {"proc/cpt/mini_dump", sizes.mini_dump},
        {"proc/cptl/mem", sizes.memory},     {"proc/cptl/mini_dump", sizes.mini_dump},
        {"d/dipx/smsg", sizes.ipc_record},   {"d/dipx/sbuf", sizes.ipc_record},
        {"d/dipx/sblock", sizes.ipc_record},
    };
    for (const auto& file : files) {
        const fs::path path = fs::path(root) / file.name;
        std::error_code ec;
        if (file.size == 0) {
            continue;
        }
        fs::create_directories(path.parent_path(), ec);
        FILE* f = ec ? nullptr : fopen(path.c_str(), "we");
        if (!f) {
            errno = ec ? ec.value() : errno;
            return false;
        }
        const std::vector<uint8_t> data = kernel_file_content(file.name, file.size);
        const bool written = fwrite(data.data(), 1, data.size(), f) == data.size();
        if (fclose(f) != 0 || !written) {
            return false;
        }
    }
    return true;
}
