// The settings that no request tells, from the settings file of the service. The file is
// only read: it is never made, copied or mended, and what the service would complain of
// is passed over without a word.
#ifndef KESTCTL_SETTINGSFILE_H_
#define KESTCTL_SETTINGSFILE_H_

#include <string>

#include "config/CpType.h"

struct FileSettings {
    bool md = false;              // a mini dump is saved when a CP crashes
    std::string iq[CP_TYPE_NUM];  // I/Q types of each CP, "GSM WCDMA"; empty without any

    // Reads the file in the service's place, below KESTMODEM_ROOT. A line counts as it
    // does for the service, a setting without one has its default. False, with the reason
    // in words, when the file cannot be read to its end; the settings are unknown then.
    bool read(std::string* reason);

private:
    void take_line(const char* line);
    void take_iq(const char* rest);
};

#endif  // KESTCTL_SETTINGSFILE_H_
