// SPDX-License-Identifier: Apache-2.0
// Lets the calling thread, and what it starts, run on all CPUs as long as the object lives.
#ifndef BENCH_ALLCPUS_H_
#define BENCH_ALLCPUS_H_

#include <sched.h>

class AllCpus {
public:
    AllCpus();
    ~AllCpus();
    AllCpus(const AllCpus&) = delete;
    AllCpus& operator=(const AllCpus&) = delete;

private:
    cpu_set_t m_before;
};

#endif  // BENCH_ALLCPUS_H_
