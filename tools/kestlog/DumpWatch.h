// SPDX-License-Identifier: Apache-2.0
// The memory dumps in an audio DSP's log while it is written: the same ones that DspDumps finds in
// the whole log. Owned by the live tree, one for each handset, whose files are read oldest first.
#ifndef KESTLOG_DUMPWATCH_H_
#define KESTLOG_DUMPWATCH_H_

#include <stdint.h>

#include <functional>
#include <string>

#include "channels/DspChunkHeader.h"
#include "kestlog/LogReader.h"

class DumpWatch {
public:
    // A dump begins, or is complete and has so many bytes.
    typedef std::function<void(bool complete, uint64_t bytes)> Visitor;

    // Reads the chunks of the open file, which is in dir, from *known on and moves it behind the
    // last whole one. What is no chunk is passed over.
    void read(LogReader& in, const std::string& dir, uint64_t* known, const Visitor& visit);

private:
    void take(const DspChunkHeader& header, const std::string& dir, size_t len,
              const Visitor& visit);

    bool m_begun = false;  // a dump, and it is not over
    uint64_t m_bytes = 0;  // of it
    std::string m_dir;     // of the last chunk
    bool m_follows = false;
    uint32_t m_next = 0;  // number
};

#endif  // KESTLOG_DUMPWATCH_H_
