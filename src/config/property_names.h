// SPDX-License-Identifier: Apache-2.0
// Every system property and environment variable that the service reads, in one
// place. Their values belong to the handset's build and are used as given.
#ifndef CONFIG_PROPERTY_NAMES_H_
#define CONFIG_PROPERTY_NAMES_H_

// Character devices of each CP. WCN and GNSS have a diag device only.
#define PROP_WCDMA_LOG "ro.modem.w.log"
#define PROP_WCDMA_DIAG "ro.modem.w.diag"
#define PROP_TD_LOG "ro.modem.t.log"
#define PROP_TD_DIAG "ro.modem.t.diag"
#define PROP_3MODE_LOG "ro.modem.tl.log"
#define PROP_3MODE_DIAG "ro.modem.tl.diag"
#define PROP_4MODE_LOG "ro.modem.lf.log"
#define PROP_4MODE_DIAG "ro.modem.lf.diag"
#define PROP_5MODE_LOG "ro.modem.l.log"
#define PROP_5MODE_DIAG "ro.modem.l.diag"
#define PROP_WCN_DIAG "ro.modem.wcn.diag"
#define PROP_GNSS_DIAG "ro.modem.gnss.diag"

// The radio mode of the cellular modem: "1" in exactly one of them.
#define PROP_TD_ENABLE "persist.modem.t.enable"
#define PROP_WCDMA_ENABLE "persist.modem.w.enable"
#define PROP_5MODE_ENABLE "persist.modem.l.enable"
#define PROP_4MODE_ENABLE "persist.modem.lf.enable"
#define PROP_3MODE_ENABLE "persist.modem.tl.enable"

// "1": the CP is reset automatically after an assert.
#define PROP_MODEM_RESET "persist.sys.vexa.modemreset"
#define PROP_WCN_RESET "persist.sys.vexa.wcnreset"

// Version text of the modem's firmware.
#define PROP_BASEBAND_VERSION "gsm.version.baseband"

// The modem's firmware image: the partitions' directory, and PROP_MODEM_PREFIX with
// a suffix of each radio mode for the partition's name.
#define PROP_PARTITION_PATH "ro.product.partitionpath"
#define PROP_MODEM_PREFIX "persist.modem."
#define PROP_SUFFIX_WCDMA_NVP "w.nvp"
#define PROP_SUFFIX_TD_NVP "t.nvp"
#define PROP_SUFFIX_3MODE_NVP "tl.nvp"
#define PROP_SUFFIX_4MODE_NVP "lf.nvp"
#define PROP_SUFFIX_5MODE_NVP "l.nvp"

// Which variable of the environment names the SD card's root: 1 or 2.
#define PROP_STORAGE_TYPE "persist.storage.type"
#define ENV_EXTERNAL_STORAGE "EXTERNAL_STORAGE"
#define ENV_SECONDARY_STORAGE "SECONDARY_STORAGE"

// State of the service that mounts the SD card, and its value while it is mounted.
#define PROP_SD_SERVICE "init.svc.fuse_sdcard0"
#define SD_SERVICE_RUNNING "running"

// Ids of the users, besides root, whom the control socket serves: decimal, with commas between
// them. Unset or empty: everyone who can connect.
#define PROP_CONTROL_UIDS "persist.kestmodem.control.uids"

#endif  // CONFIG_PROPERTY_NAMES_H_
