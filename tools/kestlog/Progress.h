// SPDX-License-Identifier: Apache-2.0
// A line on the terminal that tells how far a long command is, from its second second on. Without
// an object of this class, or when standard error is no terminal, nothing is shown.
// LogReader counts what it reads, so a command only makes the object.
#ifndef KESTLOG_PROGRESS_H_
#define KESTLOG_PROGRESS_H_

#include <stdint.h>

class Progress {
public:
    // total: the bytes that will be read, or 0 when that is not known. A command that prints all
    // the time is its own progress: with talkative nothing is shown while standard output is the
    // terminal, too.
    explicit Progress(uint64_t total, bool talkative = false);
    ~Progress();
    Progress(const Progress&) = delete;
    Progress& operator=(const Progress&) = delete;

    // Counts bytes.
    static void advance(uint64_t bytes);
    // Removes the line, before anything is printed on the terminal.
    static void clear();

private:
    void show(int64_t now_ms);

    Progress* const m_outer;  // whose turn it is after this one
    const uint64_t m_total;
    const bool m_terminal;
    uint64_t m_done = 0;
    int64_t m_due_ms;
    bool m_shown = false;
};

#endif  // KESTLOG_PROGRESS_H_
