// SPDX-License-Identifier: Apache-2.0
// The sequence numbers of an audio DSP's chunks, over the files of its log.
#ifndef KESTLOG_CHUNKSEQUENCE_H_
#define KESTLOG_CHUNKSEQUENCE_H_

#include <stdint.h>

#include <string>

#include "kestlog/FileScan.h"
#include "kestlog/LogTree.h"

class ChunkSequence {
public:
    // Before the first chunk of a file. In another set the numbers may begin anew.
    void enter(const TreeDir& dir) {
        m_other_dir |= dir.path() != m_dir;
        m_dir = dir.path();
        m_first = true;
    }

    // Takes the next chunk of any kind. The chunks that are missing before it; negative when
    // the numbers go back. Says in the report what the scan of one file cannot see: a gap
    // between two files.
    int32_t take(const Piece& chunk, FileReport* report) {
        m_anew = !m_follows || (m_other_dir && chunk.seq_num != m_next);
        m_other_dir = false;
        const int32_t missing = m_anew ? 0 : static_cast<int32_t>(chunk.seq_num - m_next);
        if (m_first && missing != 0) {
            ++report->sequence_gaps;
            report->add(false, "sequence",
                        "chunk " + std::to_string(chunk.seq_num) + " where " +
                            std::to_string(m_next) + " was expected",
                        static_cast<int64_t>(chunk.offset));
        }
        m_first = false;
        m_follows = true;
        m_next = chunk.seq_num + 1;
        return missing;
    }
    // Whether no numbers before that chunk tell what is missing: it is the first one in its set,
    // and does not go on where another set ended.
    bool anew() const { return m_anew; }

private:
    std::string m_dir;
    bool m_first = true;
    bool m_other_dir = false;
    bool m_anew = true;
    bool m_follows = false;
    uint32_t m_next = 0;
};

#endif  // KESTLOG_CHUNKSEQUENCE_H_
