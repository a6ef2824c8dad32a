// SPDX-License-Identifier: Apache-2.0

#include "config/CpType.h"

#include <string.h>

#include "config/property_names.h"
#include "core/system_paths.h"

namespace {

struct CpInfo {
    CpType type;
    const char* name;
    const char* foreign_name;
    const char* request_name;
    const char* log_prop;
    const char* diag_prop;
    const char* mem_path;
    const char* mini_dump_path;
    const char* image_suffix;
};

// In the order of the types, so that a concrete type is an index.
// clang-format off
constexpr CpInfo CP_INFO[CP_TYPE_NUM] = {
    {CT_WCDMA, "cp_wcdma",    "cp_wcdma",    "WCDMA",   PROP_WCDMA_LOG, PROP_WCDMA_DIAG,
     PATH_CPW_MEM,  PATH_CPW_MINI_DUMP,  PROP_SUFFIX_WCDMA_NVP},
    {CT_TD,    "cp_td-scdma", "cp_td-scdma", "TD",      PROP_TD_LOG,    PROP_TD_DIAG,
     PATH_CPT_MEM,  PATH_CPT_MINI_DUMP,  PROP_SUFFIX_TD_NVP},
    {CT_3MODE, "cp_3mode",    "cp_tdd-lte",  "TDD-LTE", PROP_3MODE_LOG, PROP_3MODE_DIAG,
     PATH_CPTL_MEM, PATH_CPTL_MINI_DUMP, PROP_SUFFIX_3MODE_NVP},
    {CT_4MODE, "cp_4mode",    "cp_fdd-lte",  "FDD-LTE", PROP_4MODE_LOG, PROP_4MODE_DIAG,
     PATH_CPTL_MEM, PATH_CPTL_MINI_DUMP, PROP_SUFFIX_4MODE_NVP},
    {CT_5MODE, "cp_5mode",    "cp_td-lte",   "5MODE",   PROP_5MODE_LOG, PROP_5MODE_DIAG,
     PATH_CPTL_MEM, PATH_CPTL_MINI_DUMP, PROP_SUFFIX_5MODE_NVP},
    {CT_WCN,   "cp_wcn",      "cp_wcn",      "WCN",     nullptr,        PROP_WCN_DIAG,
     nullptr,       PATH_CPTL_MINI_DUMP, PROP_SUFFIX_5MODE_NVP},
    {CT_GNSS,  "cp_gnss",     "cp_gnss",     "GNSS",    nullptr,        PROP_GNSS_DIAG,
     nullptr,       PATH_CPTL_MINI_DUMP, PROP_SUFFIX_5MODE_NVP},
    {CT_AGDSP, "agdsp",       nullptr,       "AG-DSP",  nullptr,        nullptr,
     nullptr,       PATH_CPTL_MINI_DUMP, PROP_SUFFIX_5MODE_NVP},
};
// clang-format on

constexpr bool indexed_by_type() {
    for (int i = 0; i < CP_TYPE_NUM; ++i) {
        if (CP_INFO[i].type != i) {
            return false;
        }
    }
    return true;
}
static_assert(indexed_by_type(), "CP_INFO must be in the order of the types");

const char UNKNOWN_NAME[] = "(unknown)";

const CpInfo* find_info(CpType type) {
    return type >= 0 && type < CP_TYPE_NUM ? &CP_INFO[type] : nullptr;
}

// The type whose name in the given column is the text.
CpType find_name(const char* CpInfo::*column, const void* text, size_t len) {
    for (const CpInfo& info : CP_INFO) {
        const char* name = info.*column;
        if (name && strlen(name) == len && memcmp(name, text, len) == 0) {
            return info.type;
        }
    }
    return CT_UNKNOWN;
}

// The type's cell in the given column, or fallback for a value outside the table.
const char* find_cell(const char* CpInfo::*column, CpType type, const char* fallback) {
    const CpInfo* info = find_info(type);
    return info ? info->*column : fallback;
}

}  // namespace

CpType cp_type_from_name(const void* text, size_t len) {
    return find_name(&CpInfo::name, text, len);
}

CpType cp_type_from_foreign_name(const void* text, size_t len) {
    return find_name(&CpInfo::foreign_name, text, len);
}

CpType cp_type_from_request_name(const void* text, size_t len) {
    return find_name(&CpInfo::request_name, text, len);
}

const char* cp_type_to_name(CpType type) {
    return find_cell(&CpInfo::name, type, UNKNOWN_NAME);
}

const char* cp_type_to_request_name(CpType type) {
    return find_cell(&CpInfo::request_name, type, UNKNOWN_NAME);
}

const char* cp_log_prop(CpType type) {
    return find_cell(&CpInfo::log_prop, type, nullptr);
}

const char* cp_diag_prop(CpType type) {
    return find_cell(&CpInfo::diag_prop, type, nullptr);
}

const char* cp_mem_path(CpType type) {
    return find_cell(&CpInfo::mem_path, type, PATH_CPTL_MEM);
}

const char* cp_mini_dump_path(CpType type) {
    return find_cell(&CpInfo::mini_dump_path, type, PATH_CPTL_MINI_DUMP);
}

const char* cp_image_prop_suffix(CpType type) {
    return find_cell(&CpInfo::image_suffix, type, PROP_SUFFIX_5MODE_NVP);
}
