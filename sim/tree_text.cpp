// SPDX-License-Identifier: Apache-2.0

#include "sim/tree_text.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <regex>
#include <vector>

#include "sim/byte_text.h"

namespace fs = std::filesystem;

namespace {

std::vector<fs::path> sorted_entries(const fs::path& dir) {
    std::error_code ec;
    std::vector<fs::path> entries;
    for (fs::directory_iterator it(dir, ec), end; !ec && it != end; it.increment(ec)) {
        entries.push_back(it->path());
    }
    std::sort(entries.begin(), entries.end());
    return entries;
}

std::string show_file(const fs::path& path, const std::string& shown_path) {
    std::ifstream in(path, std::ios::binary);
    const std::string bytes{std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
    std::string text = shown_path + ": " + std::to_string(bytes.size()) + " bytes\n";
    for (const std::string& piece : show_bytes(bytes)) {
        text += "    " + piece + "\n";
    }
    return text;
}

std::string show_entries(const fs::path& dir, const std::string& shown_dir) {
    static const std::regex SET("\\d{4}(-\\d\\d){5}");
    static const std::regex FILE_TIME("\\d{4}-\\d\\d-\\d\\d_\\d\\d-\\d\\d-\\d\\d");
    std::error_code ec;
    std::string text;
    unsigned sets = 0;
    for (const fs::path& path : sorted_entries(dir)) {
        const std::string name = path.filename().string();
        const std::string shown = std::regex_match(name, SET)
                                      ? "SET" + std::to_string(++sets)
                                      : std::regex_replace(name, FILE_TIME, "TIME");
        const std::string shown_path = shown_dir + "/" + shown;
        if (fs::is_directory(fs::symlink_status(path, ec))) {
            text += show_entries(path, shown_path);
        } else {
            text += show_file(path, shown_path);
        }
    }
    return text.empty() ? shown_dir + "/: empty\n" : text;
}

}  // namespace

std::string show_log_root(const std::string& handset_root, const std::string& log_root) {
    std::error_code ec;
    const fs::path dir = fs::path(handset_root) / log_root;
    return fs::is_directory(dir, ec) ? show_entries(dir, log_root) : "";
}
