// Everything that kestctl prints: results on standard output, for people or, with --json,
// as one object a line; what went wrong in words on standard error, with --json also as
// an object on standard output. Text that came from the service is printed with every
// byte that is not printable ASCII escaped. Each line is flushed at once.
#ifndef KESTCTL_OUTPUT_H_
#define KESTCTL_OUTPUT_H_

#include <string>
#include <utility>
#include <vector>

#include "kestctl/Reply.h"

class Output {
public:
    explicit Output(bool json) : m_json(json) {}

    // The result of a request that gives none.
    void ok() const;
    // A result; in JSON a number when is_number() says so.
    void value(const std::string& value) const;
    void notification(const Notification& notification) const;
    // Settings by their names, and for every CP its log state and its I/Q types.
    typedef std::vector<std::pair<std::string, std::string>> Table;
    void status(const Table& settings, const Table& logs, const Table& iqs) const;
    // Something that is not as it should be, on standard error only.
    void remark(const std::string& words) const;
    // A line as the service sent it. Not for JSON.
    void line(const std::string& line) const;
    bool json() const { return m_json; }

    // Both return the exit status.
    int error_reply(int code) const;
    int failure(int status, const std::string& words) const;

private:
    bool m_json;
};

#endif  // KESTCTL_OUTPUT_H_
