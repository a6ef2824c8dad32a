// SPDX-License-Identifier: Apache-2.0
// The parameters of a control request: a reader that takes one after the other in the
// forms that requests use. It does not own the text, which need not be NUL-terminated,
// and never looks beyond it. What is wrong with a parameter is for the request's own
// handler to say.
#ifndef CLIENT_REQUESTPARAMS_H_
#define CLIENT_REQUESTPARAMS_H_

#include <stddef.h>
#include <stdint.h>

#include "client/RequestTable.h"
#include "config/CpType.h"

enum ParamError {
    PE_NONE = 0,
    PE_MISSING,  // no token is left
    PE_INVALID,  // the token is malformed
    PE_EXTRA     // a token is left where none may be
};

class RequestParams {
public:
    // The most CPs that one request may list.
    static constexpr size_t MAX_CPS = MAX_REQUEST_CPS;

    RequestParams(const uint8_t* text, size_t len) : m_pos(text), m_end(text + len) {}

    // CP name: one token.
    ParamError take_cp(CpType& type);

    // CP list: all that is left, one to MAX_CPS names, none of them twice.
    ParamError take_cp_list(CpType (&types)[MAX_CPS], size_t& num);

    // Size: one token of decimal digits, up to 4294967295.
    ParamError take_size(uint32_t& mb);

    // One token; equals tells whether it is that word.
    ParamError take_word(const char* word, bool& equals);

    // No token is left; else PE_EXTRA. Carriage returns may be.
    ParamError take_end() const;

    // Blank rest: only spaces and tabs are left.
    bool is_blank() const;

private:
    const uint8_t* take_token(size_t& len);

    const uint8_t* m_pos;
    const uint8_t* const m_end;
};

#endif  // CLIENT_REQUESTPARAMS_H_
