// SPDX-License-Identifier: Apache-2.0

#include "simulation/Media.h"

#include <string.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <map>
#include <set>

#include "sim/SimModemImage.h"
#include "sim/files.h"
#include "sim/sha1.h"
#include "simulation/Calls.h"
#include "simulation/Ledger.h"
#include "simulation/Plan.h"

namespace fs = std::filesystem;

namespace {

constexpr size_t IMAGE_SIZE = 100000;
const char* const HOSTILE_NAMES[] = {
    "it's; rm -rf x",      "-rf",    "$(id)", "9999-99-99-99-99-99",
    "2020-01-01-00-00-00", "a b\nc", "0",     "*"};

// In an order that is the same each time.
std::vector<fs::path> entries(const fs::path& dir) {
    std::vector<fs::path> found;
    std::error_code error;
    for (fs::directory_iterator it(dir, error), end; !error && it != end; it.increment(error)) {
        found.push_back(it->path());
    }
    std::sort(found.begin(), found.end());
    return found;
}

bool is_dir(const fs::path& path) {
    return fs::is_directory(fs::symlink_status(path));
}

std::vector<fs::path> dirs(const fs::path& dir) {
    std::vector<fs::path> found = entries(dir);
    found.erase(std::remove_if(found.begin(), found.end(), std::not_fn(is_dir)), found.end());
    return found;
}

template <typename T>
const T* pick(const std::vector<T>& all, Chance& chance) {
    return all.empty() ? nullptr : &all[static_cast<size_t>(chance.below(all.size()))];
}

}  // namespace

std::string Media::log_root(MediumId medium) const {
    return m_root + (medium == MED_DATA ? "/data" : "/card") +
           (g_state->kest_layout ? "/kest/modem_log" : "/modem_log");
}

unsigned Media::stream_of(const std::string& path) {
    const std::string dir = fs::path(path).parent_path().filename();
    for (unsigned stream = 0; stream < CHANNEL_COUNT; ++stream) {
        if (dir == STREAM_NAMES[stream]) {
            return stream;
        }
    }
    return CHANNEL_COUNT;
}

bool Media::is_log_name(const std::string& name) {
    const size_t digits = name.find_first_not_of("0123456789");
    return digits != 0 && digits != std::string::npos && name[digits] == '-' && name.size() > 4 &&
           name.compare(name.size() - 4, 4, ".log") == 0;
}

bool Media::is_capture_name(const std::string& name) {
    return name.find("_wiq_") != std::string::npos;
}

// ---- Cards

void Media::pull_card() {
    if (!g_state->card_in) {
        return;
    }
    g_state->card_in = g_state->pulled_seen = g_state->card_fresh = false;
    g_state->card_read_only = false;
    g_state->room[MED_CARD] = UINT64_MAX;
    ++g_state->card_generation;
    rename((m_root + "/card").c_str(),
           (m_root + "/cards/" + std::to_string(g_state->card)).c_str());
    mkdir((m_root + "/card").c_str(), 0775);
    // What was staged for it is lost, in every channel.
    ledger::excuse_all();
}

void Media::insert_card(Card card) {
    State& state = *g_state;
    if (state.card_in) {
        return;
    }
    rmdir((m_root + "/card").c_str());
    if (card == EMPTY) {
        state.card_fresh = state.pulled_seen;
        state.card_bytes = state.counters.bytes;
        state.card = ++state.cards;
        mkdir((m_root + "/card").c_str(), 0775);
    } else {
        state.card -= card == FORMER && state.card > 0;
        rename((m_root + "/cards/" + std::to_string(state.card)).c_str(),
               (m_root + "/card").c_str());
    }
    if (card != SAME && !state.pulled_seen) {
        state.tampered = state.scan_failed = true;  // it is taken for the last one
    }
    state.card_in = true;
}

bool Media::is_doubtful(MediumId medium) {
    return (g_state->tampered || g_state->faulted) && !(medium == MED_CARD && g_state->card_fresh);
}

std::vector<std::string> Media::trees() const {
    std::vector<fs::path> media = dirs(m_root + "/cards");
    media.insert(media.begin(), {m_root + "/data", m_root + "/card"});
    std::vector<std::string> all;
    for (const fs::path& medium : media) {
        all.push_back(medium / "modem_log");
        all.push_back(medium / "kest/modem_log");
    }
    return all;
}

// ---- Looking

Media::Seen Media::look(MediumId medium, const std::string& in_use) const {
    return look_at(log_root(medium), in_use);
}

std::vector<std::string> Media::captures() const {
    std::vector<std::string> all;
    for (const std::string& tree : trees()) {
        const std::vector<std::string> more = look_at(tree).captures;
        all.insert(all.end(), more.begin(), more.end());
    }
    return all;
}

Media::Seen Media::look_at(const std::string& tree, const std::string& in_use) const {
    Seen seen;
    const std::vector<fs::path> sets = dirs(tree);
    for (const fs::path& set : sets) {
        uint64_t spared = 0;
        for (const fs::path& cp : dirs(set)) {
            std::map<uint64_t, uint64_t> sizes;
            for (const fs::path& file : entries(cp)) {
                if (!fs::is_regular_file(fs::symlink_status(file))) {
                    continue;
                }
                const uint64_t size = fs::file_size(file);
                seen.bytes += size;
                if (is_capture_name(file.filename())) {
                    seen.captures.push_back(file);
                    spared += size;
                } else if (file.extension() == ".version") {
                    spared += size;
                }
                const unsigned stream = stream_of(file);
                if (is_log_name(file.filename()) && stream < CHANNEL_COUNT) {
                    const uint64_t number = strtoull(file.filename().c_str(), nullptr, 10);
                    seen.logs.push_back({file, stream, number, size});
                    sizes[number] = size;
                }
            }
            if (!sizes.empty()) {
                spared += sizes.begin()->second + sizes.rbegin()->second;
            }
        }
        seen.most_spared = std::max(seen.most_spared, spared);
        seen.spared = set == in_use ? spared : seen.spared;
    }
    return seen;
}

bool Media::holds(unsigned stream, const char* kind, const std::string& content) const {
    for (const std::string& tree : trees()) {
        for (const fs::path& set : dirs(tree)) {
            for (const fs::path& file : entries(set / STREAM_NAMES[stream])) {
                if (file.filename().native().find(kind) != std::string::npos &&
                    fs::file_size(file) == content.size() && read_text_file(file) == content) {
                    return true;
                }
            }
        }
    }
    return false;
}

bool Media::must_refuse(MediumId medium, uint64_t quota, bool overwrite) const {
    // What is staged counts and is not seen here.
    constexpr uint64_t UNSEEN = CHANNEL_COUNT * 2 * 65536;
    const Seen seen = look(medium);
    return quota != 0 && (overwrite ? seen.most_spared : seen.bytes) + UNSEEN >= quota;
}

// ---- Other people's hands

void Media::book_removal(const std::string& path) const {
    const unsigned stream = stream_of(path);
    if (!fs::is_regular_file(fs::symlink_status(path))) {
        return;
    }
    const uint64_t size = fs::file_size(path);
    if (stream < CHANNEL_COUNT && is_log_name(fs::path(path).filename())) {
        ledger::file_removed(path, stream);
    }
    const bool card = path.compare(0, m_root.size() + 6, m_root + "/card/") == 0;
    uint64_t& room = g_state->room[card ? MED_CARD : MED_DATA];
    room = room > UINT64_MAX - size ? UINT64_MAX : room + size;
}

void Media::remove_all(const std::string& path) {
    if (is_dir(path)) {
        for (const fs::path& each : entries(path)) {
            remove_all(each);
        }
        rmdir(path.c_str());
        return;
    }
    book_removal(path);
    unlink(path.c_str());
}

void Media::remove_matching(const std::string& dir) {
    for (const fs::path& each : entries(dir)) {
        if (isdigit(each.filename().native()[0])) {
            remove_all(each);
        }
    }
}

void Media::remove_something(uint64_t what, Chance chance) {
    const std::string tree = log_root(chance.one_in(2) ? MED_DATA : MED_CARD);
    const std::vector<fs::path> sets = dirs(tree);
    const fs::path* const set =
        sets.empty() || chance.one_in(2) ? pick(sets, chance) : &sets.back();
    const std::vector<fs::path> cps = set ? dirs(*set) : std::vector<fs::path>();
    const fs::path* const cp = pick(cps, chance);
    const std::vector<fs::path> files = cp ? entries(*cp) : std::vector<fs::path>();
    const fs::path* const file = what % DEL_COUNT == DEL_FILE ? pick(files, chance)
                                 : files.empty()              ? nullptr
                                                              : &files.front();
    const fs::path whole(tree);
    const fs::path* const victims[DEL_COUNT] = {file, file, cp, set, &whole};  // by DeleteWhat
    const fs::path* const victim = victims[what % DEL_COUNT];
    if (!victim) {
        return;
    }
    trace("somebody deletes %s", victim->c_str());
    g_state->tampered = true;
    g_state->card_fresh = false;
    remove_all(*victim);
}

void Media::make_something(uint64_t what, Chance chance) {
    const MediumId medium = chance.one_in(2) || !g_state->card_in ? MED_DATA : MED_CARD;
    const std::vector<fs::path> sets = dirs(log_root(medium));
    const std::vector<fs::path> cps = sets.empty() ? sets : dirs(sets.back());
    const fs::path dir = cps.empty() ? fs::path(log_root(medium)) : *pick(cps, chance);
    const fs::path path = dir / chance.pick(HOSTILE_NAMES);
    if (fs::exists(fs::symlink_status(path))) {
        return;
    }
    trace("somebody makes %s", path.c_str());
    g_state->tampered = true;
    g_state->card_fresh = false;
    std::error_code ignored;
    switch (what % 5) {
        case 0:
            std::ofstream(path) << "stranger";
            break;
        case 1:
            mkdir(path.c_str(), 0775);
            std::ofstream(path / "inside") << "stranger";
            break;
        case 2:
            fs::create_symlink("/etc", path, ignored);  // there may be no log root
            break;
        case 3:
            mkfifo(path.c_str(), 0666);
            break;
        default:
            mkdir((fs::path(log_root(medium)) / chance.pick(HOSTILE_NAMES)).c_str(), 0775);
            break;
    }
}

void Media::install_image(uint64_t number, uint64_t how) {
    enum Kind { GOOD, SHORT, FOREIGN, GONE };
    const Kind kind = static_cast<Kind>(how < 4 ? how : 0);
    std::vector<uint8_t> bytes = SimModemImage(IMAGE_SIZE, static_cast<uint32_t>(number)).bytes();
    g_state->image = kind == GOOD ? static_cast<uint32_t>(number) : 0;
    if (kind == SHORT) {
        bytes.resize(static_cast<size_t>(number % bytes.size()));
    } else if (kind == FOREIGN) {
        bytes[number % 16] ^= 0x20;
    }
    const std::string path = m_root + "/image/w_modem";
    unlink(path.c_str());
    if (kind != GONE) {
        std::ofstream(path, std::ios::binary)
            .write(reinterpret_cast<const char*>(bytes.data()),
                   static_cast<std::streamsize>(bytes.size()));
    }
}

// ---- Checks

void Media::check_bytes() const {
    uint64_t there[STREAM_COUNT] = {};
    for (const std::string& tree : trees()) {
        for (const LogFileSeen& log : look_at(tree).logs) {
            for (unsigned stream : ledger::streams_in(log.stream)) {
                there[stream] += ledger::stream_bytes(log.path, stream);
            }
        }
    }
    for (unsigned stream = 0; stream < STREAM_COUNT; ++stream) {
        const StreamState& s = g_state->streams[stream];
        // The first bytes of a header that was cut off there may look like the payload's last.
        const uint64_t expected = s.stored - s.removed;
        const uint64_t difference =
            there[stream] > expected ? there[stream] - expected : expected - there[stream];
        if (difference > 3 * s.cuts) {
            fail_run("media",
                     "stream %u: %llu bytes on the media, %llu written and %llu of them deleted",
                     stream, number(there[stream]), number(s.stored), number(s.removed));
        }
    }
}

void Media::check_libraries(std::optional<MediumId> in_use) const {
    const SimModemImage image(IMAGE_SIZE, g_state->image);
    for (const std::string& tree : trees()) {
        const std::string library = read_text_file(tree + "/modem_db.gz");
        const std::string digest = read_text_file(tree + "/sha1.txt");
        const std::string own =
            digest_text(sha1(reinterpret_cast<const uint8_t*>(library.data()), library.size()));
        if (!library.empty() && digest.size() == own.size() && digest != own) {
            fail_run("library", "the digest in %s is not the library's", tree.c_str());
        }
    }
    if (in_use && g_state->image && !image.saved_in(log_root(*in_use))) {
        fail_run("library", "medium %d has not that of the image", *in_use);
    }
}

void Media::check_names() const {
    constexpr uint64_t MAX_SIZE = (2 << 20) + 65536;
    for (MediumId medium : {MED_DATA, MED_CARD}) {
        if (is_doubtful(medium)) {
            continue;
        }
        std::map<std::string, std::set<uint64_t>> numbers;
        for (const LogFileSeen& log : look(medium).logs) {
            if (log.size > MAX_SIZE) {
                fail_run("size", "%s has %llu bytes", log.path.c_str(), number(log.size));
            }
            if (!numbers[fs::path(log.path).parent_path()].insert(log.number).second) {
                fail_run("numbers", "%s: its number is there twice", log.path.c_str());
            }
        }
        for (auto& dir : numbers) {
            // The first file's number, the largest, is its own affair.
            dir.second.erase(std::prev(dir.second.end()));
            if (dir.second.empty()) {
                continue;
            }
            const uint64_t missing = *dir.second.rbegin() + 1 - dir.second.size();
            const bool no_zero = dir.second.count(0) == 0 && g_state->full_seen;
            if (missing > (g_state->killed ? 1u : 0u) + (no_zero ? 1u : 0u)) {
                fail_run("numbers", "%s: %llu numbers are missing", dir.first.c_str(),
                         number(missing));
            }
        }
    }
}
