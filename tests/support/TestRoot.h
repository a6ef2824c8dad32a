// SPDX-License-Identifier: Apache-2.0
// Help shared by all tests: a temporary directory that stands for the handset's "/",
// the capture of the service's log, and waiting for a condition.
#ifndef TESTS_SUPPORT_TESTROOT_H_
#define TESTS_SUPPORT_TESTROOT_H_

#include <gtest/gtest.h>
#include <stdint.h>
#include <unistd.h>

#include <functional>
#include <string>
#include <vector>

// A fresh root directory with "data" in it, named by KESTMODEM_ROOT while the object
// lives; removed with everything below it at the end. Paths given are relative to it.
class TestRoot {
public:
    TestRoot();
    ~TestRoot();
    TestRoot(const TestRoot&) = delete;
    TestRoot& operator=(const TestRoot&) = delete;

    const std::string& root() const { return m_root; }
    std::string path(const std::string& rel) const { return m_root + "/" + rel; }

    void make_dir(const std::string& rel) const;                                // with its parents
    void write_file(const std::string& rel, const std::string& content) const;  // parents too
    std::string read_file(const std::string& rel) const;
    bool exists(const std::string& rel) const;
    // Names in a directory, sorted, without "." and "..".
    std::vector<std::string> list(const std::string& rel) const;
    // Files below a directory, as paths relative to it, sorted.
    std::vector<std::string> tree(const std::string& rel) const;

    // Files anywhere in the root that have the part in their path relative to it, sorted.
    std::vector<std::string> find(const std::string& part) const;

    // Sets one property in default.prop, replacing the file by rename; "" removes it.
    void set_prop(const std::string& key, const std::string& value);

private:
    std::string m_root;
    std::vector<std::pair<std::string, std::string>> m_props;
};

// Collects what the service writes to standard error while the object lives.
class LogCapture {
public:
    LogCapture();
    ~LogCapture();
    LogCapture(const LogCapture&) = delete;
    LogCapture& operator=(const LogCapture&) = delete;

    std::string text() const;                 // everything so far
    bool has(const std::string& part) const;  // part occurs in it
    size_t count(const std::string& part) const;
    void clear();

private:
    int m_saved;
    int m_file;
};

int64_t monotonic_ms();

// How often the part occurs in the text.
size_t occurrences(const std::string& text, const std::string& part);

// The arguments as main gets them, with a null at the end; valid as long as they are.
std::vector<char*> argv_of(std::vector<std::string>& args);

// Runs the condition, and something between two runs of it, until it is true or the time is
// over; true when it became true. The time is one that no loaded machine misses.
bool wait_until(
    const std::function<bool()>& condition, int timeout_ms = 60000,
    const std::function<void()>& meanwhile = [] { usleep(2000); });

// Number of descriptors that this process has open.
size_t open_descriptors();

// Deterministic bytes without a short period, for comparing streams.
std::string pattern_bytes(size_t len, uint32_t seed);

#endif  // TESTS_SUPPORT_TESTROOT_H_
