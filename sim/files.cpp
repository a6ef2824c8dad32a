// SPDX-License-Identifier: Apache-2.0

#include "sim/files.h"

#include <stdio.h>
#include <stdlib.h>

#include <filesystem>
#include <fstream>
#include <system_error>

std::string read_text_file(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::string text;
    std::error_code ec;
    const auto size = std::filesystem::file_size(path, ec);
    text.reserve(ec ? 0 : static_cast<size_t>(size));
    char block[65536];  // files may have many megabytes
    while (in.read(block, sizeof(block)), in.gcount() > 0) {
        text.append(block, static_cast<size_t>(in.gcount()));
    }
    return text;
}

std::string temp_dir() {
    // Programs that are started elsewhere get it, too.
    const char* tmp = getenv("TMPDIR");
    if (!tmp || !*tmp) {
        return "/tmp";
    }
    std::error_code ec;
    const std::string path = std::filesystem::absolute(tmp, ec).string();
    return ec ? tmp : path;
}

bool has_room(const std::string& dir, uint64_t needed, std::string* problem) {
    namespace fs = std::filesystem;
    const double mb = 1 << 20;
    std::error_code ec;
    fs::path place = dir.empty() ? fs::path(temp_dir()) : fs::absolute(dir, ec);
    while (place.has_relative_path() && !fs::exists(place, ec)) {
        place = place.parent_path();
    }
    const fs::space_info space = fs::space(place, ec);
    if (ec || space.available >= needed) {
        return true;
    }
    char text[128];
    snprintf(text, sizeof text, ": %.0f MB are free, %.0f MB are needed",
             static_cast<double>(space.available) / mb, static_cast<double>(needed) / mb);
    *problem = "not enough room in " + place.string() + text +
               "; set TMPDIR, or name a place with --root DIR";
    return false;
}

std::string make_temp_dir(const std::string& parent, const std::string& prefix) {
    std::string path = parent + "/" + prefix + ".XXXXXX";
    return mkdtemp(path.data()) ? path : "";
}

bool remove_dir(const std::string& path) {
    std::error_code ec;
    if (!path.empty()) {
        std::filesystem::remove_all(path, ec);
    }
    return !ec;
}
