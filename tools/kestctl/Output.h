// SPDX-License-Identifier: Apache-2.0
// Everything that kestctl prints. Results go to standard output, as text or, with --json,
// as one object per line. Errors go to standard error as text and, with --json, also to
// standard output as an object. Text from the service is escaped. Each line is flushed.
#ifndef KESTCTL_OUTPUT_H_
#define KESTCTL_OUTPUT_H_

#include <string>
#include <utility>
#include <vector>

#include "kestctl/Reply.h"

class Output {
public:
    // timed: notifications begin with the local time.
    Output(bool json, bool timed) : m_json(json), m_timed(timed) {}

    // For a request without a result.
    void ok() const;
    // A result; in JSON a number when is_number() says so.
    void value(const std::string& value) const;
    // False with errno set when it could not be written. main looks whether the others were.
    bool notification(const Notification& notification) const;
    // The settings by name, and the log state and the I/Q types of each CP.
    typedef std::vector<std::pair<std::string, std::string>> Table;
    void status(const Table& settings, const Table& logs, const Table& iqs) const;
    // A warning, on standard error only.
    void remark(const std::string& words) const;
    // A line of the service. Not for JSON.
    void line(const std::string& line) const;
    bool json() const { return m_json; }

    // Both return the exit status.
    int error_reply(int code) const;
    int failure(int status, const std::string& words) const;

private:
    bool m_json;
    bool m_timed;
};

#endif  // KESTCTL_OUTPUT_H_
