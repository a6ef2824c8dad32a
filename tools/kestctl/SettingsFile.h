// SPDX-License-Identifier: Apache-2.0
// The settings that no request returns, read from the settings file of the service. The
// file is never created, copied or repaired, and lines that the service would report are
// ignored silently.
#ifndef KESTCTL_SETTINGSFILE_H_
#define KESTCTL_SETTINGSFILE_H_

#include <string>

#include "config/CpType.h"

struct FileSettings {
    bool md = false;              // a mini dump is saved when a CP crashes
    std::string iq[CP_TYPE_NUM];  // I/Q types of each CP, "GSM WCDMA"; empty when there are none

    // Reads the service's file below KESTMODEM_ROOT, by the service's rules: a setting
    // without a line has its default. False, with a reason for the user, when the file
    // cannot be read to its end; the settings are unknown then.
    bool read(std::string* reason);

private:
    void take_line(const char* line);
    void take_iq(const char* rest);
};

#endif  // KESTCTL_SETTINGSFILE_H_
