// SPDX-License-Identifier: Apache-2.0
// Reader of the general logging service's configuration file, of which only the CP log
// streams and the global switch matter here; every other line is skipped. Lives for one
// reload request: created, filled by one read_config(), iterated and destroyed.
#ifndef CONFIG_KESTCONFIG_H_
#define CONFIG_KESTCONFIG_H_

#include <utils/List.h>

#include "config/CpType.h"

class KestConfig {
public:
    struct StreamEntry {
        CpType type;
        bool enable;
    };

    KestConfig();
    ~KestConfig();
    KestConfig(const KestConfig&) = delete;
    KestConfig& operator=(const KestConfig&) = delete;

    // Reads the file at path, used as given. Malformed stream lines are logged and skipped.
    // Without the global "enable" line every entry comes out disabled. Returns -1 when the
    // file cannot be opened or read to its end.
    int read_config(const char* path);

    // In file order, a CP named twice included: the later entry decides. Owned here.
    const android::List<StreamEntry*>& stream_entries() const { return m_streams; }

private:
    // 0, or -1 when the line is invalid.
    int parse_line(const char* line);
    int parse_stream_line(const char* rest);

    android::List<StreamEntry*> m_streams;
    bool m_enable;
};

#endif  // CONFIG_KESTCONFIG_H_
