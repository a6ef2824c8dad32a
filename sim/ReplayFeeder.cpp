// SPDX-License-Identifier: Apache-2.0

#include "sim/ReplayFeeder.h"

#include <algorithm>

#include "sim/DspChunkReader.h"
#include "sim/RecordedStream.h"
#include "sim/SimHandset.h"
#include "sim/compare_streams.h"
#include "sim/device_control.h"

namespace {

const size_t PIECE = 64 << 10;

// Data that a device has not taken yet.
struct Piece {
    std::vector<uint8_t> data;
    size_t done = 0;

    bool empty() const { return done == data.size(); }
    // True when the device took something.
    bool feed(SimLogDevice& device, uint64_t* fed) {
        const ssize_t n = device.feed(data.data() + done, data.size() - done);
        if (n <= 0) {
            return false;
        }
        done += static_cast<size_t>(n);
        *fed += static_cast<uint64_t>(n);
        return true;
    }
};

class StreamFeeder : public ReplayFeeder {
public:
    StreamFeeder(SimCp& device, const RecordedCp& cp)
        : ReplayFeeder(cp), m_device(device), m_stream(cp) {}

    bool feed(uint64_t until) override {
        bool fed = false;
        while (!m_done) {
            if (m_piece.empty()) {
                const uint64_t at = m_stream.position();
                if (at >= until && at < m_cp.size()) {
                    break;
                }
                m_piece.data.resize(static_cast<size_t>(std::min<uint64_t>(PIECE, until - at)));
                m_piece.data.resize(m_stream.read(m_piece.data.data(), m_piece.data.size()));
                m_piece.done = 0;
                m_done = m_piece.data.empty();
                fed = true;
            } else if (m_piece.feed(m_device.log, &m_device.fed)) {
                fed = true;
            } else {
                break;
            }
        }
        return fed;
    }
    uint64_t position() const override {
        return m_stream.position() - (m_piece.data.size() - m_piece.done);
    }
    bool taken() const override { return m_device.log.pending() == 0; }
    std::vector<std::string> problems() const override { return m_stream.problems(); }

    bool compare(const RecordedCp* written, std::vector<std::string>* lines) const override {
        RecordedStream original(m_cp);
        const RecordedCp none;
        RecordedStream copy(written ? *written : none);
        const StreamDifference result = compare_streams(original, copy, m_device.fed);
        lines->push_back(result.text(m_cp.name, m_device.fed));
        return result.equal;
    }

private:
    SimCp& m_device;
    RecordedStream m_stream;
    Piece m_piece;
};

class DspFeeder : public ReplayFeeder {
public:
    DspFeeder(SimDspDevice& dsp, const RecordedCp& cp)
        : ReplayFeeder(cp), m_dsp(dsp), m_reader(cp) {}

    bool feed(uint64_t until) override {
        bool fed = false;
        while (!m_done && (!m_piece.empty() || next_piece(until, &fed))) {
            if (m_source == DspSource::DUMP) {
                // The whole memory is there at once when the DSP asserts.
                m_dump.insert(m_dump.end(), m_piece.data.begin(), m_piece.data.end());
                m_piece.done = m_piece.data.size();
            } else {
                const bool log = m_source == DspSource::LOG;
                if ((!m_dump.empty() && !dump()) || m_dsp.dumps_taken() != m_dumps ||
                    !m_piece.feed(log ? m_dsp.log() : m_dsp.pcm(), &fed_of(m_source))) {
                    break;
                }
            }
            fed = true;
        }
        return fed;
    }
    uint64_t position() const override { return m_reader.position(); }
    bool taken() const override {
        return m_dsp.log().pending() == 0 && m_dsp.pcm().pending() == 0 &&
               m_dsp.dumps_taken() == m_dumps;
    }
    std::vector<std::string> problems() const override { return m_reader.problems(); }

    bool compare(const RecordedCp* written, std::vector<std::string>* lines) const override {
        const RecordedCp none;
        bool equal = true;
        for (const auto& [source, label] : {std::pair(DspSource::LOG, " log"),
                                            {DspSource::PCM, " PCM"},
                                            {DspSource::DUMP, " dump"}}) {
            const uint64_t fed = m_fed[static_cast<size_t>(source)];
            DspSourceStream original(m_cp, source);
            DspSourceStream copy(written ? *written : none, source);
            const StreamDifference result = compare_streams(original, copy, fed);
            if (fed > 0 || !result.equal) {
                lines->push_back(result.text(m_cp.name + label, fed));
            }
            equal = equal && result.equal;
        }
        return equal;
    }

private:
    uint64_t& fed_of(DspSource source) { return m_fed[static_cast<size_t>(source)]; }

    // False when there is none before that position, or a dump has to be taken first.
    bool next_piece(uint64_t until, bool* fed) {
        if (m_dump.size() + PIECE > DSP_MEMORY_SIZE && !dump()) {
            return false;
        }
        if (m_reader.position() >= until && m_reader.position() < m_cp.size()) {
            return false;
        }
        m_piece.done = 0;
        if (m_reader.next(&m_source, &m_piece.data)) {
            return true;
        }
        m_piece.data.clear();
        m_done = m_dump.empty() || dump();
        *fed = *fed || m_done;
        return false;
    }
    // What was sent before has to be taken first: the order in the log would be another one.
    bool dump() {
        if (!taken() || !m_dsp.crash(m_dump)) {
            return false;
        }
        ++m_dumps;
        fed_of(DspSource::DUMP) += m_dump.size();
        m_dump.clear();
        return true;
    }

    SimDspDevice& m_dsp;
    DspChunkReader m_reader;
    DspSource m_source = DspSource::UNKNOWN;
    Piece m_piece;
    std::vector<uint8_t> m_dump;
    unsigned m_dumps = 0;
    uint64_t m_fed[static_cast<size_t>(DspSource::UNKNOWN)] = {};
};

}  // namespace

std::unique_ptr<ReplayFeeder> ReplayFeeder::make(SimHandset& handset, const RecordedCp& cp) {
    if (cp.audio_dsp()) {
        return handset.add_audio_dsp() ? std::make_unique<DspFeeder>(handset.audio_dsp(), cp)
                                       : nullptr;
    }
    SimCp* device = handset.add_cp(cp.name);
    return device ? std::make_unique<StreamFeeder>(*device, cp) : nullptr;
}
