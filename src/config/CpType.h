// SPDX-License-Identifier: Apache-2.0
// The co-processors (CPs) and all their names. The configuration files, the control
// requests and the system properties each have their own vocabulary; one table in
// CpType.cpp holds them all, and the functions below look up in it. All names are
// constants: nothing returned here is owned by the caller.
#ifndef CONFIG_CPTYPE_H_
#define CONFIG_CPTYPE_H_

#include <stddef.h>

enum CpType : int {
    CT_UNKNOWN = -1,
    CT_WCDMA = 0,
    CT_TD = 1,
    CT_3MODE = 2,
    CT_4MODE = 3,
    CT_5MODE = 4,
    CT_WCN = 5,
    CT_GNSS = 6,
    CT_AGDSP = 7,
    // The cellular modem, whichever of the first five it is (LogConfig::wan_modem_type).
    CT_WANMODEM = 9
};

// Number of concrete CPs: they are 0 to CP_TYPE_NUM - 1 and may index an array.
constexpr int CP_TYPE_NUM = 8;

// Names to types: exact match of all len bytes, case-sensitive; CT_UNKNOWN otherwise.
CpType cp_type_from_name(const void* text, size_t len);          // own configuration file
CpType cp_type_from_foreign_name(const void* text, size_t len);  // general logger's file
CpType cp_type_from_request_name(const void* text, size_t len);  // control requests

// Types to names; "(unknown)" for a value that is no concrete CP.
const char* cp_type_to_name(CpType type);          // own configuration file
const char* cp_type_to_request_name(CpType type);  // control requests

// Property that names the CP's log or diag device; null when it has none.
const char* cp_log_prop(CpType type);
const char* cp_diag_prop(CpType type);

// Kernel file with the modem's memory; null for a CP without one (a value that is no concrete
// CP is taken for a modem). Fixed path: pass it through system_path() before use.
const char* cp_mem_path(CpType type);

// Kernel file with the mini dump; never null. Fixed path, as above.
const char* cp_mini_dump_path(CpType type);

// What follows PROP_MODEM_PREFIX in the property of the modem's image partition; never
// null.
const char* cp_image_prop_suffix(CpType type);

#endif  // CONFIG_CPTYPE_H_
