// SPDX-License-Identifier: Apache-2.0

#include "storage/StorageManager.h"

#include <cutils/properties.h>
#include <errno.h>
#include <string.h>

#include <algorithm>

#include "config/property_names.h"
#include "core/Multiplexer.h"
#include "core/list_find.h"
#include "core/log.h"
#include "core/system_paths.h"
#include "storage/CpStorage.h"

// Nothing happens when a card's rest is over: the next write tries the card.
StorageManager::StorageManager()
    : m_internal(this),
      m_external(this),
      m_card_rest_timer(
          nullptr, [](void*) {}, nullptr) {}

StorageManager::~StorageManager() {
    for (CpStorage* storage : m_storages) {
        delete storage;
    }
}

int StorageManager::init(const android::String8& sd_root, LogController* /*ctrl*/,
                         Multiplexer* mux) {
    if (mux) {
        m_card_rest_timer.bind(mux->timer_mgr());
    }
    android::String8 internal_top = system_path(PATH_DATA_PARTITION);
    // Without a known SD card the external log root is a fixed path.
    android::String8 external_top = sd_root.isEmpty() ? system_path("") : sd_root;
    if (m_kest_layout) {
        internal_top.append(DIR_KEST);
        external_top.append(DIR_KEST);
        info_log("modem log in store manager in kest/modem_log!!!");
    }
    // A link in the data partition itself is the administrator's, to a larger partition say.
    m_internal.set_dirs(internal_top, m_kest_layout ? Links::REFUSE : Links::FOLLOW);
    m_external.set_dirs(external_top, Links::REFUSE);
    if (m_internal.stat() < 0) {
        return -1;
    }
    if (is_sd_mounted() && m_external.stat() < 0) {
        err_log("init external storage failure");
    }
    return 0;
}

void StorageManager::set_overwrite(bool overwrite) {
    m_internal.set_overwrite(overwrite);
    m_external.set_overwrite(overwrite);
}

void StorageManager::set_file_size(uint32_t size) {
    m_internal.set_file_size(size);
    m_external.set_file_size(size);
}

MediaStorage* StorageManager::get_media(MediaType type) {
    switch (type) {
        case MT_INTERNAL:
            return &m_internal;
        case MT_EXTERNAL:
            return &m_external;
        default:
            return nullptr;
    }
}

bool StorageManager::is_sd_mounted() const {
    char value[PROPERTY_VALUE_MAX];
    property_get(PROP_SD_SERVICE, value, "");
    return strcmp(value, SD_SERVICE_RUNNING) == 0;
}

void StorageManager::change_media(MediaType type) {
    m_media_type = type;
    m_media_change_clients.notify(type);
}

bool StorageManager::check_media_change() {
    if (is_sd_mounted()) {
        if (m_media_type == MT_EXTERNAL) {
            return false;
        }
        if (m_card_rest_timer.pending()) {
            return use_internal();
        }
        info_log("Storage changing to external SD");
        bool usable = m_external.scanned();
        if (!usable) {
            usable = m_external.stat() == 0;
            if (!usable) {
                err_log("init SD card failed");
            }
        }
        return (usable && use_external()) || use_internal();
    }
    if (m_media_type == MT_EXTERNAL) {
        info_log("sd card is umounted!");
        m_ext_umount_clients.notify();
        stop_all_storages();
    } else if (!m_external.sets().empty()) {
        m_ext_umount_clients.notify();  // it was in use once: a dump may lie on it
    }
    card_removed();
    if (m_media_type == MT_INTERNAL) {
        return false;
    }
    m_internal.start_set();
    change_media(MT_INTERNAL);
    return true;
}

// Nothing that is known of this card, in use or not, holds for the next one.
void StorageManager::card_removed() {
    if (m_external.scanned() || !m_external.sets().empty()) {
        m_external.clear();
    }
    m_card_suspect = false;
    m_card_rest_ms = CARD_REST_MS;
    m_card_rest_timer.stop();
}

// A dying card's file system becomes read-only, its driver gives up, or it is gone while it
// still counts as mounted. When the service itself lacks something, the card is not to blame.
bool StorageManager::write_failed(MediaStorage* media, int error) {
    const bool own_want =
        error == 0 || error == EMFILE || error == ENFILE || error == ENOMEM || error == EINTR;
    if (media != &m_external || m_media_type != MT_EXTERNAL || own_want) {
        return false;
    }
    errno = error;
    err_log("SD card can not be written, not in use for now");
    stop_all_storages();
    m_media_type = MT_NONE;
    if (m_card_suspect) {
        rest_card();  // it was tried again, seemed to work and failed
    }
    m_card_suspect = true;
    return true;
}

// Sees to it that the card is not tried with every block.
void StorageManager::rest_card() {
    m_card_rest_timer.start(m_card_rest_ms);
    m_card_rest_ms = std::min(2 * m_card_rest_ms, MAX_CARD_REST_MS);
}

// Takes the SD card into use with a new set. False when no set can be started there.
bool StorageManager::use_external() {
    // Sometimes a directory can be made, or exists, where no file can be made.
    if (m_card_suspect && !m_external.can_make_files()) {
        return false;
    }
    if (!m_external.start_set()) {
        if (errno == ENOSPC && m_external.overwrite()) {
            rest_card();  // with every try more would be deleted on it, in vain
        }
        return false;
    }
    if (m_media_type == MT_INTERNAL) {
        stop_all_storages();
    }
    change_media(MT_EXTERNAL);
    return true;
}

// Falls back to the internal medium while the SD card cannot be used. False when it is
// in use already or no set can be started there.
bool StorageManager::use_internal() {
    if (m_media_type == MT_INTERNAL || !m_internal.start_set()) {
        return false;
    }
    change_media(MT_INTERNAL);
    return true;
}

CpStorage* StorageManager::create_storage(CpChannel* channel) {
    CpStorage* storage = new CpStorage(this, channel);
    m_storages.push_back(storage);
    return storage;
}

void StorageManager::delete_storage(CpStorage* storage) {
    android::List<CpStorage*>::iterator it = find_object(m_storages, storage);
    if (it != m_storages.end()) {
        m_storages.erase(it);
        delete storage;
    }
}

void StorageManager::stop_all_storages() {
    for (CpStorage* storage : m_storages) {
        storage->stop();
    }
}

void StorageManager::media_vanished(const MediaStorage* media) {
    if (media == get_media_stor()) {
        stop_all_storages();
    }
}

void StorageManager::clear_all() {
    stop_all_storages();
    m_internal.clear_all();
    m_external.clear_all();
    m_media_type = MT_NONE;
}

void StorageManager::subscribe_media_change_evt(void* client, media_change_callback callback) {
    m_media_change_clients.add(client, callback);
}

void StorageManager::unsubscribe_media_change_evt(void* client) {
    m_media_change_clients.remove(client);
}

void StorageManager::subscribe_ext_stor_umount_evt(void* client, ext_umount_callback callback) {
    m_ext_umount_clients.add(client, callback);
}

void StorageManager::unsubscribe_ext_stor_umount_evt(void* client) {
    m_ext_umount_clients.remove(client);
}
