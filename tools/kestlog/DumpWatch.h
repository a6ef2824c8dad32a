// SPDX-License-Identifier: Apache-2.0
// The memory dumps in an audio DSP's log while it is written. Owned by the live tree, one for each
// directory, whose files are read oldest first.
#ifndef KESTLOG_DUMPWATCH_H_
#define KESTLOG_DUMPWATCH_H_

#include <stdint.h>

#include <functional>

#include "kestlog/LogReader.h"

class DumpWatch {
public:
    // A dump begins, or is complete and has so many bytes.
    typedef std::function<void(bool complete, uint64_t bytes)> Visitor;

    // Reads the chunks of the open file from *known on and moves it behind the last whole one;
    // UINT64_MAX when it holds something else, which is not read any further.
    void read(LogReader& in, uint64_t* known, const Visitor& visit);

private:
    bool m_begun = false;  // and not complete
    uint64_t m_bytes = 0;
    uint32_t m_seq = 0;  // of its last chunk
};

#endif  // KESTLOG_DUMPWATCH_H_
