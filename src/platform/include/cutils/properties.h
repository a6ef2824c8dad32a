// SPDX-License-Identifier: Apache-2.0
// The platform's system properties, read-only. On this host they are the lines
// "key=value" of the text file "default.prop" in the root directory.
#ifndef PLATFORM_CUTILS_PROPERTIES_H_
#define PLATFORM_CUTILS_PROPERTIES_H_

// Size of a value buffer, the terminating NUL included.
#define PROP_VALUE_MAX 92
#define PROPERTY_VALUE_MAX PROP_VALUE_MAX

#ifdef __cplusplus
extern "C" {
#endif

// Copies the value of a property into value, a buffer of PROPERTY_VALUE_MAX bytes,
// and returns its length. Without the file or the key, or with a value that does not
// fit, the result is default_value (cut to fit; null counts as "").
//
// A change of the file is seen by the next read. While the file does not change, a
// read costs one stat: nothing is opened and nothing is allocated. May be called from
// any thread; leaves errno as it was.
//
// File: '#' as the first byte makes a line a comment; everything after the first '='
// is the value, blanks included; the last line for a key counts; one carriage return
// before the line feed is dropped; a line without '=', with an empty key or with a NUL
// byte is skipped. A file over 1 MiB, or anything but a regular file, counts as missing.
int property_get(const char* key, char* value, const char* default_value);

#ifdef __cplusplus
}
#endif

#endif  // PLATFORM_CUTILS_PROPERTIES_H_
