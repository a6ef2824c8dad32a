// SPDX-License-Identifier: Apache-2.0

#include "sim/files.h"

#include <stdlib.h>

#include <filesystem>
#include <fstream>
#include <sstream>

std::string read_text_file(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();  // in blocks: files may have many megabytes
    return text.str();
}

std::string temp_dir() {
    const char* tmp = getenv("TMPDIR");
    return tmp && *tmp ? tmp : "/tmp";
}

std::string make_temp_dir(const std::string& parent, const std::string& prefix) {
    std::string path = parent + "/" + prefix + ".XXXXXX";
    return mkdtemp(path.data()) ? path : "";
}

void remove_dir(const std::string& path) {
    std::error_code ignored;
    if (!path.empty()) {
        std::filesystem::remove_all(path, ignored);
    }
}
