// SPDX-License-Identifier: Apache-2.0
// Owns the two media, the internal data partition and the external SD card, decides
// which of them is in use, follows the SD card coming and going, makes the CP storages
// through which the channels write, and tells subscribers when the medium in use
// changes or the SD card goes away.
//
// Owned by the LogController for the life of the process. The medium in use is not
// chosen at start-up but on every write of every CP. Main thread only; subscribers are
// called inside a CP storage's write and must not destroy that storage.
#ifndef STORAGE_STORAGEMANAGER_H_
#define STORAGE_STORAGEMANAGER_H_

#include <stdint.h>
#include <utils/List.h>
#include <utils/String8.h>

#include "core/OneShotTimer.h"
#include "storage/MediaStorage.h"
#include "storage/MediaType.h"
#include "storage/SubscriberList.h"

class CpChannel;
class CpStorage;
class LogController;
class Multiplexer;

class StorageManager {
public:
    typedef void (*media_change_callback)(void* client, MediaType type);
    typedef void (*ext_umount_callback)(void* client);

    StorageManager();
    // Destroys the CP storages that are still listed.
    ~StorageManager();
    StorageManager(const StorageManager&) = delete;
    StorageManager& operator=(const StorageManager&) = delete;

    // Sets the directories of both media and scans them. sd_root: the SD card's root,
    // as given by the environment; empty: its log root is "/modem_log". mux, not owned, has
    // the timers. 0, or -1 when the internal medium cannot be scanned.
    int init(const android::String8& sd_root, LogController* ctrl = nullptr,
             Multiplexer* mux = nullptr);

    // Places the log roots in the kest directories. Call before init.
    void set_kest_layout(bool kest_layout) { m_kest_layout = kest_layout; }
    bool kest_layout() const { return m_kest_layout; }

    // Limits in bytes; they apply from the next check.
    void set_overwrite(bool overwrite);
    void set_file_size(uint32_t size);
    void set_data_part_size(uint64_t size) { m_internal.set_quota(size); }
    void set_sd_size(uint64_t size) { m_external.set_quota(size); }

    // The medium of a type; null for MT_NONE.
    MediaStorage* get_media(MediaType type);
    // The medium in use, or null.
    MediaStorage* get_media_stor() { return get_media(m_media_type); }
    MediaType media_type() const { return m_media_type; }

    // Chooses the medium to write to; true when that changed.
    bool check_media_change();
    bool is_sd_mounted() const;

    // A CP storage for the channel; destroyed by delete_storage.
    CpStorage* create_storage(CpChannel* channel);
    void delete_storage(CpStorage* storage);
    // Every CP storage closes and forgets its current file.
    void stop_all_storages();
    // Called by a medium whose log root or working set vanished, or is about to go.
    void media_vanished(const MediaStorage* media);
    // The medium did not take a file, a directory or data, for the reason error gives, which is
    // not that it is full. An SD card in use that cannot be written any more is not in use from
    // now on: the next check for a change falls back to the internal medium and tries the card
    // again. True when another try may succeed.
    bool write_failed(MediaStorage* media, int error);
    // Deletes every set on both media; the next write chooses the medium afresh.
    void clear_all();

    void subscribe_media_change_evt(void* client, media_change_callback callback);
    void unsubscribe_media_change_evt(void* client);
    // Called when an SD card that holds sets is found unmounted, in use or not, before they
    // are forgotten. The callback must not make files.
    void subscribe_ext_stor_umount_evt(void* client, ext_umount_callback callback);
    void unsubscribe_ext_stor_umount_evt(void* client);

private:
    // How long an SD card that keeps failing is left alone: at first, and at most after doubling
    // with each failure.
    static constexpr unsigned int CARD_REST_MS = 3000;
    static constexpr unsigned int MAX_CARD_REST_MS = 600000;

    void rest_card();
    void card_removed();
    bool use_external();
    bool use_internal();
    void change_media(MediaType type);

    MediaType m_media_type = MT_NONE;
    MediaStorage m_internal;
    MediaStorage m_external;
    android::List<CpStorage*> m_storages;
    SubscriberList<media_change_callback> m_media_change_clients;
    SubscriberList<ext_umount_callback> m_ext_umount_clients;
    bool m_kest_layout = false;
    bool m_card_suspect = false;  // it failed in use since it was mounted
    unsigned int m_card_rest_ms = CARD_REST_MS;
    OneShotTimer m_card_rest_timer;  // pending: the card is left alone
};

#endif  // STORAGE_STORAGEMANAGER_H_
