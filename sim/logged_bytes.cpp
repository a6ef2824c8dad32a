// SPDX-License-Identifier: Apache-2.0

#include "sim/logged_bytes.h"

#include <ctype.h>

#include <filesystem>
#include <map>
#include <utility>

#include "sim/DspLogCheck.h"
#include "sim/files.h"

namespace fs = std::filesystem;

namespace {

const char TIME_RECORD[] = "xV4\x12";
const size_t TIME_RECORD_SIZE = 16;

}  // namespace

std::vector<std::string> logged_bytes(const std::string& cp_dir) {
    std::error_code ec;
    // The highest number is the oldest; of equal ones the name, that is, the time tells.
    std::map<std::pair<long, std::string>, std::string> files;
    for (fs::directory_iterator it(cp_dir, ec), end; !ec && it != end; it.increment(ec)) {
        const std::string name = it->path().filename().string();
        if (isdigit(static_cast<unsigned char>(name[0])) != 0) {
            files[{-strtol(name.c_str(), nullptr, 10), name}] = it->path().string();
        }
    }
    std::vector<std::string> contents;
    DspLogCheck chunks;
    for (const auto& [key, path] : files) {
        contents.push_back(read_text_file(path));
        chunks.add_file(path);
        if (contents.back().compare(0, sizeof TIME_RECORD - 1, TIME_RECORD) == 0) {
            contents.back().erase(0, TIME_RECORD_SIZE);
        }
    }
    if (fs::path(cp_dir).filename() == "agdsp") {
        const std::vector<uint8_t>& log = chunks.data(DspSource::LOG);
        return {std::string(log.begin(), log.end())};
    }
    return contents;
}
