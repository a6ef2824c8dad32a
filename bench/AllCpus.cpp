// SPDX-License-Identifier: Apache-2.0

#include "bench/AllCpus.h"

#include <string.h>

AllCpus::AllCpus() {
    sched_getaffinity(0, sizeof(m_before), &m_before);
    cpu_set_t all;
    memset(&all, 0xff, sizeof(all));  // the kernel leaves out what there is not
    sched_setaffinity(0, sizeof(all), &all);
}

AllCpus::~AllCpus() {
    sched_setaffinity(0, sizeof(m_before), &m_before);
}
