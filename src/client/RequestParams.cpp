// SPDX-License-Identifier: Apache-2.0

#include "client/RequestParams.h"

#include "core/text.h"

const uint8_t* RequestParams::take_token(size_t& len) {
    const uint8_t* token = get_token(m_pos, static_cast<size_t>(m_end - m_pos), len);
    m_pos = token ? token + len : m_end;
    return token;
}

ParamError RequestParams::take_cp(CpType& type) {
    size_t len;
    const uint8_t* token = take_token(len);
    if (!token) {
        return PE_MISSING;
    }
    type = cp_type_from_request_name(token, len);
    return type == CT_UNKNOWN ? PE_INVALID : PE_NONE;
}

ParamError RequestParams::take_cp_list(CpType (&types)[MAX_CPS], size_t& num) {
    bool listed[CP_TYPE_NUM] = {};
    num = 0;
    CpType type;
    ParamError error;
    while ((error = take_cp(type)) == PE_NONE) {
        if (num == MAX_CPS || listed[type]) {
            return PE_INVALID;
        }
        listed[type] = true;
        types[num++] = type;
    }
    return error == PE_MISSING && num ? PE_NONE : error;
}

ParamError RequestParams::take_size(uint32_t& mb) {
    size_t len;
    const uint8_t* token = take_token(len);
    if (!token) {
        return PE_MISSING;
    }
    uint64_t number = 0;
    for (size_t i = 0; i < len; ++i) {
        if (token[i] < '0' || token[i] > '9') {
            return PE_INVALID;
        }
        number = number * 10 + static_cast<uint64_t>(token[i] - '0');
        if (number > UINT32_MAX) {
            return PE_INVALID;
        }
    }
    mb = static_cast<uint32_t>(number);
    return PE_NONE;
}

ParamError RequestParams::take_word(const char* word, bool& equals) {
    size_t len;
    const uint8_t* token = take_token(len);
    if (!token) {
        return PE_MISSING;
    }
    equals = token_equals(token, len, word);
    return PE_NONE;
}

ParamError RequestParams::take_end() const {
    size_t len;
    return get_token(m_pos, static_cast<size_t>(m_end - m_pos), len) ? PE_EXTRA : PE_NONE;
}

bool RequestParams::is_blank() const {
    for (const uint8_t* p = m_pos; p < m_end; ++p) {
        if (*p != ' ' && *p != '\t') {
            return false;
        }
    }
    return true;
}
