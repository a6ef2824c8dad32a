// SPDX-License-Identifier: Apache-2.0
// Runs a fuzz target without a fuzzer: over every file of a directory, over beginnings of
// each, and over changes of it that are the same at every run. The input that ends the
// program stays in a file beside the program, as does the log, a sanitizer's report in it.
#include <algorithm>
#include <filesystem>
#include <vector>

#include "fuzz/fuzz.h"
#include "sim/files.h"

namespace {

constexpr size_t CHANGES_PER_FILE = 20;
constexpr size_t MAX_PREFIXES = 30;

std::vector<std::string> read_files(const char* dir) {
    std::vector<std::string> contents;
    for (const auto& entry : std::filesystem::directory_iterator(dir)) {
        contents.push_back(read_text_file(entry.path()));
    }
    std::sort(contents.begin(), contents.end());
    return contents;
}

void run(const std::string& input, int file) {
    FUZZ_CHECK(ftruncate(STDERR_FILENO, 0) == 0 && ftruncate(file, 0) == 0);
    FUZZ_CHECK(pwrite(file, input.data(), input.size(), 0) == static_cast<ssize_t>(input.size()));
    // Exactly as long as it is said to be, for a sanitizer to watch.
    const std::vector<uint8_t> exact(input.begin(), input.end());
    LLVMFuzzerTestOneInput(exact.data(), exact.size());
}

size_t below(size_t limit) {
    static uint64_t state = 88172645463325252u;
    state ^= state << 13;
    state ^= state >> 7;
    state ^= state << 17;
    return static_cast<size_t>(state % limit);
}

void change(std::string& text, const std::string& other) {
    static const char BYTES[] = "\0\n\r\t \x7d\x7e\xff-_.0129xX#\\\x80\x01";
    const size_t at = below(text.size() + 1);
    if (below(4) == 0) {  // goes on as another file does
        text.replace(at, std::string::npos, other, below(other.size() + 1));
    } else {
        const char byte = BYTES[below(sizeof(BYTES) - 1)];
        text.replace(at, below(2) * below(40), below(3) * (1 + below(2) * below(100)), byte);
    }
}

}  // namespace

int main(int argc, char** argv) {
    const std::vector<std::string> files = read_files(argc == 2 ? argv[1] : ".");
    const std::string input = argv[0] + std::string(".input");
    const std::string log = argv[0] + std::string(".log");
    dprintf(STDOUT_FILENO, "last input: %s, its log: %s\n", input.c_str(), log.c_str());
    const int fd = open(input.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
    FUZZ_CHECK(!files.empty() && fd >= 0 && freopen(log.c_str(), "a", stderr));
    for (const std::string& file : files) {
        const size_t step = file.size() / MAX_PREFIXES + 1;
        for (size_t len = file.size() % step; len <= file.size(); len += step) {
            run(file.substr(0, len), fd);
        }
        for (size_t i = 0; i < CHANGES_PER_FILE; ++i) {
            std::string changed = file;
            for (size_t num = 1 + below(4); num > 0; --num) {
                change(changed, files[below(files.size())]);
            }
            run(changed, fd);
        }
    }
    return 0;
}
