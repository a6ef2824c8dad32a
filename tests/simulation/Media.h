// SPDX-License-Identifier: Apache-2.0
// The media as somebody sees them who looks from outside, and what others do to them: cards
// that come and go, files that are deleted or made under the service's hands.
#ifndef SIMULATION_MEDIA_H_
#define SIMULATION_MEDIA_H_

#include <stdint.h>
#include <sys/stat.h>

#include <optional>
#include <string>
#include <vector>

#include "simulation/Chance.h"
#include "simulation/State.h"

class Media {
public:
    explicit Media(const std::string& root) : m_root(root) {}

    struct LogFileSeen {
        std::string path;
        unsigned stream;
        uint64_t number;
        uint64_t size;
    };
    struct Seen {
        std::vector<LogFileSeen> logs;
        uint64_t bytes = 0;        // of all files
        uint64_t spared = 0;       // of those that a quota does not delete, of the set in use
        uint64_t most_spared = 0;  // the same of the set that has most of it
        std::vector<std::string> captures;  // of I/Q buffers
    };

    // The I/Q captures on all media.
    std::vector<std::string> captures() const;
    std::string log_root(MediumId medium) const;

    void pull_card();
    enum Card { SAME, EMPTY, FORMER };  // FORMER: the one before the last, if there was one
    void insert_card(Card card);
    // Everything of one medium that is there now. in_use: the set that is being written.
    Seen look(MediumId medium, const std::string& in_use = "") const;
    // Whether a file of the stream's directory, with this in its name, has that content.
    bool holds(unsigned stream, const char* kind, const std::string& content) const;
    // Whether the medium is so full, by its quota, that a write has to be refused.
    bool must_refuse(MediumId medium, uint64_t quota, bool overwrite) const;

    // Somebody else's hands.
    void remove_something(uint64_t what, Chance chance);
    // The modem's firmware image becomes another one, or a broken one.
    void install_image(uint64_t number, uint64_t how);
    void make_something(uint64_t what, Chance chance);
    // rm -fr, also of a pattern at the end. Log files that go are booked.
    void remove_all(const std::string& path);
    void remove_matching(const std::string& dir);
    // Books a file that is about to be deleted.
    void book_removal(const std::string& path) const;

    // Compares the bytes that were written with those that are there, on every card, and the
    // names with their rules.
    void check_bytes() const;
    // A digest beside a parsing library is its own. in_use: this medium has that of the image.
    void check_libraries(std::optional<MediumId> in_use) const;
    void check_names() const;
    // The stream whose directory this is part of, or CHANNEL_COUNT.
    static unsigned stream_of(const std::string& path);
    // What happened to the medium, numbers and totals need not be right.
    static bool is_doubtful(MediumId medium);
    static bool is_capture_name(const std::string& name);
    static bool is_log_name(const std::string& name);

private:
    std::vector<std::string> trees() const;
    Seen look_at(const std::string& tree, const std::string& in_use = "") const;

    const std::string m_root;
};

#endif  // SIMULATION_MEDIA_H_
