// SPDX-License-Identifier: Apache-2.0
// Feeds what a CP has logged into its devices again: never more than they take, never out of
// order. The audio DSP's data goes to the device of its source; its log and its PCM capture
// wait while a memory dump is taken, as the DSP that has asserted does.
#ifndef SIM_REPLAYFEEDER_H_
#define SIM_REPLAYFEEDER_H_

#include <stdint.h>

#include <memory>
#include <string>
#include <vector>

#include "sim/RecordedCard.h"

class SimHandset;

class ReplayFeeder {
public:
    // Adds the CP with its devices to the handset. Both must outlive the feeder. Null with the
    // handset's error() on failure.
    static std::unique_ptr<ReplayFeeder> make(SimHandset& handset, const RecordedCp& cp);
    virtual ~ReplayFeeder() = default;
    ReplayFeeder(const ReplayFeeder&) = delete;
    ReplayFeeder& operator=(const ReplayFeeder&) = delete;

    // Feeds until so many bytes of the recording are dealt with or the devices take no more.
    // True when it got something done.
    virtual bool feed(uint64_t until) = 0;
    // Bytes of the recording dealt with so far.
    virtual uint64_t position() const = 0;
    // The service has taken everything that was fed.
    virtual bool taken() const = 0;
    // Everything was fed.
    bool done() const { return m_done; }
    // What was met of damage so far, a line for people each.
    virtual std::vector<std::string> problems() const = 0;

    // What the devices took and what the service wrote of it, compared byte for byte: a line
    // for people for each device's data. written may be null. True when all is equal.
    virtual bool compare(const RecordedCp* written, std::vector<std::string>* lines) const = 0;

protected:
    explicit ReplayFeeder(const RecordedCp& cp) : m_cp(cp) {}

    const RecordedCp& m_cp;
    bool m_done = false;
};

#endif  // SIM_REPLAYFEEDER_H_
