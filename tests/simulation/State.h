// SPDX-License-Identifier: Apache-2.0
// What survives a kill of the service: the state of the world around it and of the model that
// judges it. Lies in memory that all lives of the service, each a process of its own, share; so
// it is plain data.
#ifndef SIMULATION_STATE_H_
#define SIMULATION_STATE_H_

#include <stddef.h>
#include <stdint.h>

#include "config/CpType.h"

// The log streams, one a channel, and what else goes into the log of the audio DSP.
enum StreamId : unsigned {
    ST_WCDMA,
    ST_WCN,
    ST_GNSS,
    ST_DSP,
    CHANNEL_COUNT,
    ST_PCM = CHANNEL_COUNT,
    ST_DUMP,
    STREAM_COUNT
};
// Those of the channels are also their directories'.
constexpr const char* STREAM_NAMES[STREAM_COUNT] = {"cp_wcdma", "cp_wcn",  "cp_gnss",
                                                    "agdsp",    "DSP PCM", "DSP dump"};
constexpr CpType STREAM_TYPES[STREAM_COUNT] = {CT_WCDMA, CT_WCN,   CT_GNSS,
                                               CT_AGDSP, CT_AGDSP, CT_AGDSP};
enum MediumId : unsigned { MED_DATA, MED_CARD, MEDIUM_COUNT };

// The settings that clients can ask for, as they were set last.
enum SettingId : unsigned {
    SET_FILE_MB,
    SET_DATA_MB,
    SET_CARD_MB,
    SET_OVERWRITE,
    SET_MD_INTERNAL,
    SETTING_COUNT
};

struct Setting {
    unsigned value;
    bool uncertain;  // it was being changed when something failed, or by two at a time
};

// The bytes of one log device.
struct StreamState {
    uint64_t fed;       // given by the device so far
    uint64_t consumed;  // read by the service
    uint64_t written;   // up to where the service has written or lost them
    uint64_t stored;    // bytes that went to a file
    uint64_t removed;   // of these: went with a file that was deleted
    // Bytes of answers that the service read as log data, because no exchange ran.
    uint64_t answers_logged;
    bool answers_seen;  // there were such, at any time
    uint64_t cuts;      // chunks that a full medium cut off
    uint64_t unplaced;  // bytes in files, behind a gap, of slices too short to be placed
    // How much may be lost, for what happened while not more than this was consumed.
    uint64_t excuse;
    uint64_t excuse_until;
    bool gone;  // the device cannot be opened
    Setting logged;
    uint8_t answers;  // how the diag device answers
};

enum KestConf : uint32_t { KEST_ON = 1, KEST_MODEM = 2, KEST_WCN = 4 };

struct FaultRule {
    bool active;
    uint8_t call;
    uint8_t place;
    int error;  // 0: fewer bytes than asked for
    uint32_t skip;
    uint32_t times;  // UINT32_MAX: from now on
};

// The I/Q memory device and the buffer that it reported last.
struct IqState {
    bool in_use;
    bool filled;
    bool taken;   // the service asked where it is
    bool failed;  // a write of it
    uint32_t offset;
    uint32_t len;
    uint32_t saved;
    uint32_t stops;  // that the loop asked for and the thread has not answered
};

constexpr size_t MAX_FAULTS = 8;

struct Counters {
    uint64_t events;
    uint64_t calls;
    uint64_t faults;
    uint64_t kills;
    uint64_t bytes;
    uint64_t requests;
    uint64_t replies;
    uint64_t dumps;
    uint64_t iq_bytes;
    uint64_t thread_steps;
};

// For %llu.
inline unsigned long long number(uint64_t n) {
    return n;
}

struct State {
    int64_t boot_ns;
    int64_t wall_ns;  // to be added for the time of day
    uint32_t zone;
    size_t next_event;
    uint64_t digest;
    uint64_t pass_calls;  // number of the call with which this pass of the loop began
    uint64_t kill_at;     // number of the call that does not return; 0: none
    int64_t props_ns;     // when the properties were last changed
    uint32_t lives;

    StreamState streams[STREAM_COUNT];
    IqState iq;
    bool dump_unconfirmed;  // read from the DSP's dump device, which was not told so
    uint32_t image;         // number of the modem's firmware image; 0: none, or a broken one
    uint32_t kest_conf;     // which streams the other service's file switches on
    bool kest_layout;       // the service runs with the option -s
    bool next_layout;       // and does so from the next start on
    bool card_in;
    bool card_read_only;
    uint32_t card;                // number of the card in the slot, or of the last one
    uint32_t cards;               // number of the newest one
    uint32_t card_generation;     // counts pulls
    uint64_t room[MEDIUM_COUNT];  // bytes left; UINT64_MAX: no limit
    FaultRule faults[MAX_FAULTS];
    bool fault_in_step;  // something failed since the loop last waited
    bool fault_seen;     // a call failed by a rule since everything was calm
    bool starting;
    int64_t calm_ns;         // when everything was put in order; 0: something happened since
    bool reply_lost;         // by a failed write, since everything was calm
    bool pulled_seen;        // the service read log data while the card was out: it knows
    bool card_fresh;         // nothing happened to this card since it came, empty and noticed
    int64_t card_failed_ns;  // when it last took nothing: it may rest for ten minutes
    bool full_seen;          // a full medium took nothing, at any time
    uint64_t card_bytes;     // read before it came
    bool scan_failed;        // or left out: what was not read may not be counted
    bool tampered;           // files were deleted or made by others: names need not be contiguous
    bool killed;
    bool faulted;  // fault_seen, at any time in the run
    Setting settings[SETTING_COUNT];
    bool save_failed;       // the settings file may be older than the settings
    bool save_cut;          // a write to it failed or took a part only, in this pass
    uint32_t time_answers;  // TimeAnswers
    bool supervisor_gone[2];
    bool cp_reset[2];
    uint32_t version;
    int64_t card_told_ns;  // when the property tells that the card went; 0: it has been told

    Counters counters;
    char failure_class[24];
    char failure[1500];
};

#endif  // SIMULATION_STATE_H_
