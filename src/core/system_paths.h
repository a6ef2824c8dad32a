// SPDX-License-Identifier: Apache-2.0
// Every path and socket name of the outside world that the service itself fixes,
// in one place, and the one function that turns such a path into the path to use.
// Paths that come from a property or from the environment are used as given and
// never pass through system_path().
#ifndef CORE_SYSTEM_PATHS_H_
#define CORE_SYSTEM_PATHS_H_

#include <utils/String8.h>

// Configuration files.
#define PATH_CONFIG_FILE "/data/local/tmp/kestmodem/kest_modem.conf"
#define PATH_DEFAULT_CONFIG_FILE "/system/etc/kest_modem.conf"
#define PATH_FOREIGN_CONFIG_FILE "/data/local/tmp/kest/kest.conf"

// Storage.
#define PATH_DATA_PARTITION "/data"
#define DIR_KEST "/kest"
#define DIR_MODEM_LOG "/modem_log"
// In a log root, for a moment: whether files can be made there.
#define NAME_WRITE_TEST ".write_test"

// Kernel memory and mini dump files of the modems.
#define PATH_CPW_MEM "/proc/cpw/mem"
#define PATH_CPT_MEM "/proc/cpt/mem"
#define PATH_CPTL_MEM "/proc/cptl/mem"
#define PATH_CPW_MINI_DUMP "/proc/cpw/mini_dump"
#define PATH_CPT_MINI_DUMP "/proc/cpt/mini_dump"
#define PATH_CPTL_MINI_DUMP "/proc/cptl/mini_dump"

// Debug records of the inter-processor communication driver.
#define PATH_DIPX_SMSG "/d/dipx/smsg"
#define PATH_DIPX_SBUF "/d/dipx/sbuf"
#define PATH_DIPX_SBLOCK "/d/dipx/sblock"

// Devices.
#define PATH_AGDSP_LOG "/dev/audio_dsp_log"
#define PATH_AGDSP_PCM "/dev/audio_dsp_pcm"
#define PATH_AGDSP_MEM "/dev/audio_dsp_mem"
#define PATH_IQ_MEM "/dev/iq_mem"

// Local sockets, abstract namespace.
#define SOCKET_CONTROL "kestmodem"
#define SOCKET_MODEM_SUPERVISOR "modemd"
#define SOCKET_WCN_SUPERVISOR "external_wcn_kest"
#define SOCKET_TIME_SYNC "cp_time_sync_server"

// The path to use for a path that the service fixes: the root directory (ENV_ROOT) followed
// by path, or path itself without a root. "" gives the root directory's own prefix.
android::String8 system_path(const char* path);

#endif  // CORE_SYSTEM_PATHS_H_
