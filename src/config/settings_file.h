// SPDX-License-Identifier: Apache-2.0
// The settings file on its medium: written so that neither a kill nor a full partition
// costs the settings, and made from the system default when there is none.
//
// The file is changed in place, without a second file beside it and without waiting for the
// medium. After a kill, at whatever moment, it has the old settings or the new ones, perhaps
// with blank lines or a comment behind them.
//
// What remains: a kill may also cut one write in two, between two pages of memory. Over a file
// of more than a page (the default, with many comments) old lines may then follow the new
// ones: they are read as duplicates, and every setting has its old or its new value. A text
// that is itself more than a page, which takes a hundred "iq" lines, may be cut. And a loss of
// power leaves what the file system makes of it.
#ifndef CONFIG_SETTINGS_FILE_H_
#define CONFIG_SETTINGS_FILE_H_

#include <utils/String8.h>

// Makes text the whole content of the file at path, which is created with mode 0644 if need
// be. 0, or -1 with errno. The file has its old settings then when it could not be opened or
// grow, the new ones when only its end could not be cut off; a medium that fails in the
// middle of the text leaves the beginning of the new and the end of the old.
int put_settings(const char* path, const android::String8& text);

// True when the file at path is a copy of the default that was not finished: the default's
// beginning up to the end of a block, or nothing at all. False when one cannot be read.
bool is_unfinished_copy(const char* path, const char* default_path);

// Copies the default to path. A copy that fails, which is logged, is deleted again.
void copy_default_settings(const char* default_path, const char* path);

#endif  // CONFIG_SETTINGS_FILE_H_
