// SPDX-License-Identifier: Apache-2.0
// A program that is run beside this one, in a process group of its own so that Ctrl-C does
// not reach it, and what it cost the machine. It never outlives the thread that started it,
// nor this object.
#ifndef SIM_CHILDPROCESS_H_
#define SIM_CHILDPROCESS_H_

#include <stdint.h>
#include <sys/types.h>

#include <string>
#include <vector>

class ChildProcess {
public:
    struct Start {
        std::vector<std::string> args;         // the program first; without '/' looked for in PATH
        std::string out;                       // file for what it prints
        std::string err;                       // empty: the same
        bool append = false;                   // to these files; otherwise they are made anew
        std::vector<std::string> environment;  // NAME=value, in front of what it inherits
        int inherited = -1;                    // a further descriptor that it gets
    };
    // Of the program alone, start and end included.
    struct Cost {
        double user_s = 0;
        double system_s = 0;
        uint64_t reads = 0;   // read calls
        uint64_t writes = 0;  // write and writev calls
    };

    ChildProcess() = default;
    ~ChildProcess() { stop(); }
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    // Ends the program before it. False with errno set when no process can be made. A program
    // that cannot be run ends at once with exit status 127.
    bool start(const Start& start);
    // Whether it still runs; collects its status and cost when it does not.
    bool alive();
    // Sends a signal to the program, but not to its own children.
    void signal(int signo) const;
    // Waits for its end; false with errno EINTR when a signal comes first.
    bool wait();
    // Ends it and its children with the signal, with SIGKILL after 5 s.
    void stop(int signo = 15);

    pid_t pid() const { return m_pid; }      // -1 when it does not run
    int status() const { return m_status; }  // as waitpid gives it, once it has ended
    std::string status_text() const;         // "exit status 2", "ended by signal 15"
    const Cost& cost() const { return m_cost; }
    // What it has open, as the kernel names it, and its resident memory.
    std::vector<std::string> descriptors() const;
    size_t rss_kb() const;
    // Changes whenever the program has been on a CPU.
    std::string run_state() const;

private:
    bool collect(int options);

    pid_t m_pid = -1;
    int m_status = 0;
    Cost m_cost;
};

#endif  // SIM_CHILDPROCESS_H_
