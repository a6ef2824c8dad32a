// SPDX-License-Identifier: Apache-2.0

#include "client/uid_list.h"

#include <charconv>
#include <system_error>

UidMatch find_uid(std::string_view list, uid_t uid) {
    const uid_t no_user = static_cast<uid_t>(-1);  // to the kernel
    const char* at = list.data();
    const char* const end = at + list.size();
    UidMatch match = UidMatch::NOT_NAMED;
    for (;;) {
        uid_t named = no_user;
        const std::from_chars_result parsed = std::from_chars(at, end, named);
        if (parsed.ec != std::errc() || named == no_user) {
            return UidMatch::NO_LIST;
        }
        if (named == uid) {
            match = UidMatch::NAMED;
        }
        if (parsed.ptr == end) {
            return match;
        }
        if (*parsed.ptr != ',') {
            return UidMatch::NO_LIST;
        }
        at = parsed.ptr + 1;
    }
}
