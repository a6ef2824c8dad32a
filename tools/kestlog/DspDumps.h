// SPDX-License-Identifier: Apache-2.0
// The memory dumps in an audio DSP's log, which is where the service puts them: the dump chunks in
// a row, over the files of a handset's sets, up to the first one that is not as large as it can be.
// Into another set a dump goes on where the numbers of the chunks do. Owned by whoever goes through
// the chunks of the files, those of each handset oldest first.
#ifndef KESTLOG_DSPDUMPS_H_
#define KESTLOG_DSPDUMPS_H_

#include <stdint.h>

#include <functional>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "kestlog/ChunkSequence.h"
#include "kestlog/FileScan.h"
#include "kestlog/LogStream.h"

struct DspDump {
    std::vector<StreamFile> files;  // that it is in
    uint64_t chunks = 0;
    uint64_t bytes = 0;
    uint64_t others = 0;   // chunks of other kinds in between
    uint64_t missing = 0;  // chunks within it
    bool has_start = false;
    bool has_end = false;

    bool is_whole() const { return missing == 0 && has_start && has_end; }
    // "memory dump", or "part of a memory dump" with what is missing.
    std::string words() const;
    // "its start, 3 chunks"; "" of a whole one.
    std::string missing_words() const;
};

class DspDumps {
public:
    typedef std::function<void(const DspDump&)> Visitor;
    // The visitor gets each dump when it is over.
    explicit DspDumps(Visitor visit) : m_visit(std::move(visit)) {}

    // Before the first chunk of a file.
    void enter(const StreamFile& place);
    // Takes the next chunk of any kind; whether it belongs to a dump, which is then dump().
    bool take(const Piece& chunk);
    const DspDump& dump() const { return m_log->dump; }
    // After the last file: what has begun is over.
    void finish();

private:
    // Of a handset.
    struct Log {
        ChunkSequence sequence;
        DspDump dump;  // in progress, when it has chunks
    };

    void finish(DspDump* dump);

    const Visitor m_visit;
    StreamFile m_place{};
    std::map<size_t, Log> m_logs;
    Log* m_log = nullptr;  // of the file that was entered
};

#endif  // KESTLOG_DSPDUMPS_H_
