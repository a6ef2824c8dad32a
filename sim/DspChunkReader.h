// SPDX-License-Identifier: Apache-2.0
// Takes an audio DSP's log apart into what its sources sent. A chunk that was cut off where a
// medium was full gives the data that is there; what is no chunk is passed over and counted.
#ifndef SIM_DSPCHUNKREADER_H_
#define SIM_DSPCHUNKREADER_H_

#include <vector>

#include "sim/DspHeader.h"
#include "sim/RecordedStream.h"

class DspChunkReader {
public:
    // The CP must outlive the reader.
    explicit DspChunkReader(const RecordedCp& cp) : m_stream(cp) {}

    // The next chunk's source and data, never without any; false at the end.
    bool next(DspSource* source, std::vector<uint8_t>* data);

    // Bytes of the log taken apart so far.
    uint64_t position() const { return m_stream.position() - unread(); }
    // A line for people for each kind of damage met so far.
    std::vector<std::string> problems() const;

private:
    size_t unread() const { return m_bytes.size() - m_at; }
    bool fill();
    bool header_at(size_t offset, DspHeader* header) const;
    size_t find_header(size_t from, size_t to) const;

    RecordedStream m_stream;
    std::vector<uint8_t> m_bytes;
    size_t m_at = 0;
    bool m_ended = false;    // nothing comes behind m_bytes
    unsigned m_cut = 0;      // chunks
    uint64_t m_missing = 0;  // bytes of them
    uint64_t m_foreign = 0;  // bytes
};

// The data of one source.
class DspSourceStream : public ByteStream {
public:
    DspSourceStream(const RecordedCp& cp, DspSource source) : m_reader(cp), m_source(source) {}

    size_t read(uint8_t* dst, size_t len) override;

private:
    DspChunkReader m_reader;
    const DspSource m_source;
    std::vector<uint8_t> m_data;
    size_t m_at = 0;
};

#endif  // SIM_DSPCHUNKREADER_H_
