// SPDX-License-Identifier: Apache-2.0

#include "bench/process_figures.h"

#include <stdlib.h>

#include <filesystem>

#include "sim/files.h"

namespace fs = std::filesystem;

double process_cpu(pid_t pid) {
    double ns = 0;
    std::error_code error;
    for (const auto& task :
         fs::directory_iterator("/proc/" + std::to_string(pid) + "/task", error)) {
        ns += strtod(read_text_file(task.path() / "schedstat").c_str(), nullptr);
    }
    return ns / 1e9;
}

uint64_t process_status(pid_t pid, const char* field) {
    const std::string text = read_text_file("/proc/" + std::to_string(pid) + "/status");
    const std::string head = std::string("\n") + field + ":";
    const size_t at = text.find(head);
    return at == std::string::npos ? 0 : strtoull(text.c_str() + at + head.size(), nullptr, 10);
}
