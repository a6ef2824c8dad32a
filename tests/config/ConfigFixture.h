// SPDX-License-Identifier: Apache-2.0
// The surroundings of a configuration test: a root whose properties and environment
// let a configuration be read without a message, and a command line.
#ifndef TESTS_CONFIG_CONFIGFIXTURE_H_
#define TESTS_CONFIG_CONFIGFIXTURE_H_

#include <stdlib.h>

#include "config/LogConfig.h"
#include "support/TestRoot.h"

// The file that is saved when nothing is set.
const std::string DEFAULTS =
    "minidump disable\texternal\nlog_file_size 5\ndata_log_size 25\nsd_log_size 250\n"
    "log_overwrite enable\n\n\n#Type\tName\tState\tSize\tLevel\n";

class ConfigFixture : public testing::Test {
protected:
    ConfigFixture() {
        LogConfig::set_wan_modem_type(CT_UNKNOWN);
        root.set_prop("persist.modem.w.enable", "1");
        root.set_prop("persist.storage.type", "1");
        setenv("EXTERNAL_STORAGE", "/storage/sdcard0", 1);
        unsetenv("SECONDARY_STORAGE");
    }

    static int read(LogConfig& config, std::vector<std::string> args = {}) {
        args.insert(args.begin(), "kestmodem");
        return config.read_config(static_cast<int>(args.size()), argv_of(args).data());
    }

    TestRoot root;
    LogCapture log;
    const std::string file = root.path("kest_modem.conf");
};

#endif  // TESTS_CONFIG_CONFIGFIXTURE_H_
