// SPDX-License-Identifier: Apache-2.0

#include "support/TestRoot.h"

#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <time.h>

#include <algorithm>
#include <filesystem>
#include <fstream>

#include "sim/files.h"

namespace fs = std::filesystem;

namespace {

[[noreturn]] void die(const char* what) {
    fprintf(stderr, "test support: %s: %s\n", what, strerror(errno));
    abort();
}

// What the iterator meets, relative to the directory.
template <typename Iterator>
std::vector<std::string> sorted_names(const std::string& dir, bool directories) {
    std::vector<std::string> names;
    std::error_code ec;
    for (const auto& entry : Iterator(dir, ec)) {
        if (directories || !entry.is_directory(ec)) {
            names.push_back(fs::path(entry.path()).lexically_relative(dir));
        }
    }
    std::sort(names.begin(), names.end());
    return names;
}

}  // namespace

// Its path is a part of the names of sockets, which have 107 bytes at most.
TestRoot::TestRoot()
    : m_root(make_temp_dir(temp_dir().size() <= 60 ? temp_dir() : "/tmp", "kestmodem-test")) {
    if (m_root.empty()) {
        die("make a directory");
    }
    setenv("KESTMODEM_ROOT", m_root.c_str(), 1);
    make_dir("data");
}

TestRoot::~TestRoot() {
    unsetenv("KESTMODEM_ROOT");
    std::error_code ec;
    for (const auto& entry : fs::recursive_directory_iterator(m_root, ec)) {
        if (entry.is_directory(ec) && !entry.is_symlink(ec)) {
            fs::permissions(entry.path(), fs::perms::owner_all, fs::perm_options::add, ec);
        }
    }
    remove_dir(m_root);
}

void TestRoot::make_dir(const std::string& rel) const {
    fs::create_directories(path(rel));
}

void TestRoot::write_file(const std::string& rel, const std::string& content) const {
    fs::create_directories(fs::path(path(rel)).parent_path());
    std::ofstream out(path(rel), std::ios::binary | std::ios::trunc);
    out << content;
    out.close();
    if (!out) {
        die("write_file");
    }
}

std::string TestRoot::read_file(const std::string& rel) const {
    return read_text_file(path(rel));
}

bool TestRoot::exists(const std::string& rel) const {
    return access(path(rel).c_str(), F_OK) == 0;
}

std::vector<std::string> TestRoot::list(const std::string& rel) const {
    return sorted_names<fs::directory_iterator>(path(rel), true);
}

std::vector<std::string> TestRoot::tree(const std::string& rel) const {
    return sorted_names<fs::recursive_directory_iterator>(path(rel), false);
}

std::vector<std::string> TestRoot::find(const std::string& part) const {
    std::vector<std::string> all = tree(""), found;
    std::copy_if(all.begin(), all.end(), std::back_inserter(found),
                 [&](const auto& file) { return file.find(part) != std::string::npos; });
    return found;
}

void TestRoot::set_prop(const std::string& key, const std::string& value) {
    m_props.erase(std::remove_if(m_props.begin(), m_props.end(),
                                 [&](const auto& prop) { return prop.first == key; }),
                  m_props.end());
    if (!value.empty()) {
        m_props.emplace_back(key, value);
    }
    std::string text;
    for (const auto& prop : m_props) {
        text += prop.first + "=" + prop.second + "\n";
    }
    write_file("default.prop.new", text);
    if (rename(path("default.prop.new").c_str(), path("default.prop").c_str()) != 0) {
        die("rename default.prop");
    }
}

LogCapture::LogCapture()
    : m_saved(fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 3)), m_file(memfd_create("log", MFD_CLOEXEC)) {
    if (m_saved < 0 || m_file < 0 || dup2(m_file, STDERR_FILENO) < 0) {
        die("LogCapture");
    }
}

LogCapture::~LogCapture() {
    dup2(m_saved, STDERR_FILENO);
    close(m_saved);
    close(m_file);
}

std::string LogCapture::text() const {
    std::string all;
    char buf[4096];
    ssize_t n;
    while ((n = pread(m_file, buf, sizeof(buf), static_cast<off_t>(all.size()))) > 0) {
        all.append(buf, static_cast<size_t>(n));
    }
    return all;
}

bool LogCapture::has(const std::string& part) const {
    return text().find(part) != std::string::npos;
}

size_t LogCapture::count(const std::string& part) const {
    return occurrences(text(), part);
}

void LogCapture::clear() {
    // dup2 made standard error share this file's position.
    if (ftruncate(m_file, 0) != 0 || lseek(m_file, 0, SEEK_SET) != 0) {
        die("LogCapture::clear");
    }
}

size_t occurrences(const std::string& text, const std::string& part) {
    size_t n = 0;
    for (size_t at = text.find(part); at != std::string::npos; at = text.find(part, at + 1)) {
        ++n;
    }
    return n;
}

std::vector<char*> argv_of(std::vector<std::string>& args) {
    std::vector<char*> argv;
    for (std::string& arg : args) {
        argv.push_back(&arg[0]);
    }
    argv.push_back(nullptr);
    return argv;
}

int64_t monotonic_ms() {
    struct timespec t;
    clock_gettime(CLOCK_MONOTONIC, &t);
    return static_cast<int64_t>(t.tv_sec) * 1000 + t.tv_nsec / 1000000;
}

bool wait_until(const std::function<bool()>& condition, int timeout_ms,
                const std::function<void()>& meanwhile) {
    const int64_t end = monotonic_ms() + timeout_ms;
    while (!condition()) {
        if (monotonic_ms() > end) {
            return false;
        }
        meanwhile();
    }
    return true;
}

size_t open_descriptors() {
    const fs::directory_iterator descriptors("/proc/self/fd");
    return static_cast<size_t>(std::distance(begin(descriptors), end(descriptors))) - 1;  // its own
}

std::string pattern_bytes(size_t len, uint32_t seed) {
    std::string bytes(len, '\0');
    uint32_t x = seed * 2654435761u + 1;
    for (char& c : bytes) {
        x ^= x << 13;
        x ^= x >> 17;
        x ^= x << 5;
        c = static_cast<char>(x >> 24);
    }
    return bytes;
}
