// SPDX-License-Identifier: Apache-2.0
// Everything around one life of the service: it decides what the loop finds when it waits.
// Each time the service waits, the events that are due happen; when nothing is ready, the
// virtual time jumps to what comes next.
#ifndef SIMULATION_WORLD_H_
#define SIMULATION_WORLD_H_

#include <poll.h>
#include <stdint.h>
#include <sys/stat.h>

#include <string>

#include "simulation/Calls.h"
#include "simulation/Clients.h"
#include "simulation/Devices.h"
#include "simulation/IqDevice.h"
#include "simulation/Media.h"
#include "simulation/Peers.h"
#include "simulation/Plan.h"
#include "simulation/SavingThread.h"

class LogController;

constexpr int64_t NS_PER_MS = 1000000;
constexpr int64_t START_NS = int64_t{100} * 1000000000;

constexpr char SETTINGS_PATH[] = "/data/local/tmp/kestmodem/kest_modem.conf";

class World {
public:
    // Makes the handset's files at the root, for the first life.
    static void make_handset(const std::string& root);

    World(const std::string& root, const Plan& plan);

    const std::string& root() const { return m_root; }
    IqDevice& iq() { return m_iq; }
    SavingThread& thread() { return m_thread; }
    // The service whose loop runs; not owned.
    void attach(LogController* controller) { m_controller = controller; }

    // ---- For the calls

    bool is_loops_own(const void* fds) const;
    int wait(struct pollfd* fds, nfds_t count, int timeout, bool loops_own);
    // idle: the loop did not wait.
    void pass_ends(bool idle);
    void pump();
    Place place_of(const char* path) const;
    void file_opened(const char* path, Place place, FdInfo& info, int fd) const;
    int open_device(const char* path);
    void service_read(const FdInfo& info, size_t len);
    void dump_confirmed(int fd);
    void reading_failed() { m_last_stream = STREAM_COUNT; }
    void service_deletes(const char* path, Place place);
    // The service makes a directory, perhaps of a new set.
    void set_begins(const std::string& path) const;
    int remove_by_shell(const char* command);
    int remove_path(const std::string& path);
    // The stamps of the property file, in virtual time.
    void set_times(const char* path, struct stat& st) const;
    void message(const std::string& text);
    void service_answers(const std::string& line);
    void progress() { m_idle_passes = 0; }
    void rule_fired(Call call, Place place);

    void service_dies();
    // What a device answered, whole, is in a file whose name has this in it.
    void check_saved(unsigned stream, const char* kind) const;
    // The service is not running: what it left behind.
    void check_between_lives() const;
    // The service is not running for so long.
    void pass_without_service(int64_t ns);

    // The service is gone, its destructors have run.
    void check_end() const;

private:
    void act_next();
    void act(const Event& event);
    void act_on_supervisor(uint64_t which, uint64_t what);
    static void add_fault(const Event& event);
    static void end_faults();
    static void set_zone();
    void calm();
    void check(bool last);
    void check_descriptors() const;
    void check_totals() const;
    void check_settings() const;
    void check_settings_kept() const;
    void check_quota() const;
    void check_room_made();
    void check_card_left(bool due);
    MediumId medium_in_use() const;
    Media::Seen look_at_medium_in_use() const;
    void spins(const struct pollfd* fds, nfds_t count) const;
    void write_props() const;
    void write_kest_conf() const;
    static void no_setting_is_certain();
    bool refusal_is_due();

    const std::string m_root;
    const Plan& m_plan;
    LogController* m_controller = nullptr;
    Devices m_devices;
    IqDevice m_iq;
    SavingThread m_thread;
    Peers m_peers;
    Clients m_clients;
    Media m_media;
    unsigned m_idle_passes = 0;
    bool m_clears = false;  // the service, for the client that it answers next
    unsigned m_refused_since_deletion = UINT32_MAX / 2;
    unsigned m_refused = 0;           // blocks in a row, by a full medium
    uint64_t m_refused_from = 0;      // bytes read until the first of them
    unsigned m_lost_beside_card = 0;  // blocks in a row, while the internal medium takes all
    uint64_t m_stored = 0;            // in all, when the last of them was lost
    unsigned m_last_stream = STREAM_COUNT;
};

// The world of this process.
World& world();
void set_world(World* world);

#endif  // SIMULATION_WORLD_H_
