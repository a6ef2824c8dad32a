// SPDX-License-Identifier: Apache-2.0
// What a command that writes files found wrong with its input: said at once, as words on
// standard error or as objects with --json, and counted for the exit status.
#ifndef KESTLOG_PROBLEMS_H_
#define KESTLOG_PROBLEMS_H_

#include <stdint.h>
#include <stdio.h>

#include <string>
#include <vector>

#include "kestlog/Report.h"

class Problems {
public:
    // With json, objects go to the stream.
    Problems(bool json, FILE* stream) : m_json(json), m_stream(stream) {}

    void add(const std::string& path, const std::vector<Finding>& findings);
    // All that a scan has found, and its read error.
    void add(const std::string& path, const FileReport& report, int error);
    void unreadable(const std::string& path, int error);
    void unreadable(const std::string& words);

    bool json() const { return m_json; }
    // Prints an object to the stream.
    void print(const Json& object) const;
    uint64_t damages() const { return m_damages; }
    uint64_t notes() const { return m_notes; }
    // The exit status.
    int status() const;

private:
    bool m_json;
    FILE* m_stream;
    uint64_t m_damages = 0;
    uint64_t m_notes = 0;
    uint64_t m_unreadable = 0;
};

#endif  // KESTLOG_PROBLEMS_H_
