// SPDX-License-Identifier: Apache-2.0
// The service's settings: defaults, overridden by the command line and by the settings
// file, changed by control requests and written back whole by save(). Also finds from
// system properties what the handset's build decides: the modem type, the CPs' devices
// and the SD card's root.
//
// Owned by main(), which keeps it for the whole life of the process; the controller
// holds a plain pointer. The object is the authority once the file has been read.
#ifndef CONFIG_LOGCONFIG_H_
#define CONFIG_LOGCONFIG_H_

#include <stddef.h>
#include <stdint.h>
#include <utils/List.h>
#include <utils/String8.h>

#include "config/CpType.h"

class ConfigReader;

class LogConfig {
public:
    // One "stream" line: a CP that has a log channel. At most one per type.
    struct ConfigEntry {
        android::String8 name;  // as in the file
        CpType type;
        bool enable;
        uint32_t size;   // kept for the file's sake only
        uint32_t level;  // likewise
    };

    // One "iq" line: the I/Q captures of a CP.
    struct IqEntry {
        CpType type;
        bool gsm;
        bool wcdma;
    };

    enum IqType { IQ_GSM = 0, IQ_WCDMA = 1 };

    // config_file: path of the settings file, used as given. Reads nothing yet.
    explicit LogConfig(const char* config_file);
    ~LogConfig();
    LogConfig(const LogConfig&) = delete;
    LogConfig& operator=(const LogConfig&) = delete;

    // Reads the command line, the SD card's root, the settings file (first copied from the
    // system default when it cannot be opened, is empty or an unfinished copy) and the modem
    // type. Invalid lines are logged and skipped, limits of 0 MB logged. Returns -1 on an
    // unknown option and when no file can be opened or it cannot be read to its end.
    int read_config(int argc, char** argv);

    // Rewrites the settings file in place and clears dirty(). Returns -1, with the settings
    // dirty, when the file cannot be opened or written; the caller logs. What the file has
    // then, and after a kill, tells settings_file.h.
    int save();

    // The same if dirty(), else 0: the file is left alone.
    int save_changes();

    // True when a setting has changed since the file was last written.
    bool dirty() const { return m_dirty; }

    // Settings. Sizes are in MB. A setter makes the object dirty only on a change.
    bool save_md() const { return m_md; }
    bool md_int_stor() const { return m_md_int_stor; }  // false: on the medium in use
    bool kest_dir() const { return m_kest_dir; }
    uint32_t log_file_size() const { return m_log_file_size; }
    uint32_t data_log_size() const { return m_data_log_size; }
    uint32_t sd_log_size() const { return m_sd_log_size; }
    bool log_overwrite() const { return m_log_overwrite; }
    void set_md(bool save);
    void set_md_int_stor(bool internal);
    void set_log_file_size(uint32_t mb);
    void set_data_log_size(uint32_t mb);
    void set_sd_log_size(uint32_t mb);
    void set_log_overwrite(bool overwrite);

    // The CPs to log, in the file's order. The list and its entries stay owned here.
    const android::List<ConfigEntry*>& stream_entries() const { return m_streams; }
    const ConfigEntry* find_stream(CpType type) const;  // null when there is none
    void set_stream(CpType type, bool enable);          // no effect on a CP without entry

    // WCDMA and GSM I/Q capture of a CP, switched one by one.
    bool wcdma_iq_enabled(CpType type) const;
    void enable_iq(CpType type, int iq_type);
    void disable_iq(CpType type, int iq_type);

    // IQ_GSM, IQ_WCDMA or -1 for a token of len bytes.
    static int iq_type_from_name(const void* text, size_t len);

    // Finds the SD card's root. False, with the root unchanged, when the handset's storage
    // type or the variable that it selects is missing.
    bool get_sd_root();
    const android::String8& sd_root() const { return m_sd_root; }

    // Determines the modem type from the properties; no such property leaves it as it is.
    static void propget_wan_modem_type();

    // The concrete type of the handset's modem, one for the process; CT_UNKNOWN at first.
    static CpType wan_modem_type() { return s_wan_modem_type; }
    static void set_wan_modem_type(CpType type) { s_wan_modem_type = type; }

    // Looks up the devices of a CP, afresh at each call. On 0: same tells that log_path
    // carries log and diag traffic alike (diag_path is empty then). -1 when a device that
    // the CP needs is not known.
    int get_dev_paths(CpType type, bool& same, android::String8& log_path,
                      android::String8& diag_path);

private:
    int open_settings(ConfigReader& reader) const;  // 0, or -1 with errno
    void report_zero_limits() const;
    android::String8 file_text() const;  // the settings as save() writes them
    // The parsers of one line: 0, or -1 when the line is invalid.
    int parse_line(const char* line);
    int parse_stream_line(const char* rest);
    int parse_iq_line(const char* rest);
    int parse_minidump_line(const char* rest);

    ConfigEntry* stream_entry(CpType type) const;
    IqEntry* iq_entry(CpType type) const;
    template <typename T>
    void change(T& setting, T value);

    static CpType s_wan_modem_type;

    bool m_dirty;
    android::String8 m_sd_root;
    android::String8 m_config_file;
    android::List<ConfigEntry*> m_streams;
    bool m_md;
    bool m_md_int_stor;
    bool m_kest_dir;
    uint32_t m_log_file_size;
    uint32_t m_data_log_size;
    uint32_t m_sd_log_size;
    bool m_log_overwrite;
    android::List<IqEntry*> m_iqs;
};

#endif  // CONFIG_LOGCONFIG_H_
