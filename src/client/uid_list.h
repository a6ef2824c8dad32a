// SPDX-License-Identifier: Apache-2.0
// The list of users in PROP_CONTROL_UIDS, as somebody typed it: untrusted text.
#ifndef CLIENT_UID_LIST_H_
#define CLIENT_UID_LIST_H_

#include <sys/types.h>

#include <string_view>

enum class UidMatch { NAMED, NOT_NAMED, NO_LIST };

// Whether the list names the user. A list is one or more decimal user ids with one comma between
// two of them. Anything else, be it behind the id looked for, is none: a blank, an empty element,
// a number that is no user id.
UidMatch find_uid(std::string_view list, uid_t uid);

#endif  // CLIENT_UID_LIST_H_
