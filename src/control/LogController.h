// SPDX-License-Identifier: Apache-2.0
// The central object of the service. Owns the event loop, the storage manager, one log
// channel per configured CP, the control server and the connections to the supervisors
// for the life of the process; brings the service up, carries out the control operations,
// routes the events of the CPs and saves their crash material.
//
// Owned by main(). Everything runs on the loop's thread.
#ifndef CONTROL_LOGCONTROLLER_H_
#define CONTROL_LOGCONTROLLER_H_

#include <time.h>
#include <utils/List.h>

#include <memory>

#include "channels/CpDumpEvent.h"
#include "config/CpType.h"
#include "config/LogConfig.h"
#include "core/Multiplexer.h"
#include "state/CpStateHandler.h"
#include "storage/StorageManager.h"

class ClientManager;
class CpStorage;
class ExtWcnStateHandler;
class LogPipeHandler;
class ModemStateHandler;

class LogController {
public:
    // Sizes in MB, as settings and requests give them, become bytes by this shift.
    static constexpr int MB_TO_BYTES_SHIFT = 20;

    LogController();
    ~LogController();
    LogController(const LogController&) = delete;
    LogController& operator=(const LogController&) = delete;

    // Brings the service up with this configuration, which is not owned and outlives the
    // controller's use. 0, or -1 when the storage cannot be initialised.
    int init(LogConfig* config);
    // Runs the event loop; never returns.
    [[noreturn]] void run();

    // Builds, configures and, if it is enabled, starts the channel of one entry. Never
    // null; the caller owns it.
    LogPipeHandler* create_handler(const LogConfig::ConfigEntry* entry);

    // Connect to a supervisor; the connection is stored in handler on success.
    void init_state_handler(ModemStateHandler*& handler, const char* name);
    void init_wcn_state_handler(ExtWcnStateHandler*& handler, const char* name);

    // ---- Control operations. They wait for nothing but the media (what is staged is written,
    // files are deleted, a modem that is switched on has the parsing library of its image copied)
    // and the thread that saves I/Q samples. A change of a setting is applied to the running
    // objects first, then the configuration file is rewritten; a file that cannot be written is
    // logged and written with the next change. Sizes are in MB.

    // Switch the logging of CPs on and off; CPs without a channel are skipped. Always 0.
    int enable_log(const CpType* types, size_t num);
    int disable_log(const CpType* types, size_t num);
    // False also when the CP has no channel.
    bool get_log_state(CpType type) const;
    // Whether an assert saves a mini dump, and on which medium. 0.
    int enable_md();
    int disable_md();
    int set_md_int_stor(bool internal);
    bool get_md_int_stor() const;
    // Not supported: -1.
    int save_mini_dump_on_request();
    int set_log_file_size(size_t mb);
    size_t get_log_file_size() const;
    int set_data_part_size(size_t mb);
    size_t get_data_part_size() const;
    int set_sd_size(size_t mb);
    size_t get_sd_size() const;
    int set_log_overwrite(bool enable);
    bool get_log_overwrite() const;
    // 0, CR_NO_CHANNEL, or the channel's own result. That the file cannot be written is not logged.
    int enable_wcdma_iq(CpType type);
    int disable_wcdma_iq(CpType type);
    // Hands the buffered data of every enabled channel to the system. 0.
    int flush();
    // Deletes all CP logs on both media. 0, or CR_BUSY while a dump or transaction runs.
    int clear_log();
    // Applies the stream states of the general logging service's configuration. 0, or -1
    // when its file cannot be read.
    int reload_kest_conf();
    // The first channel of that type, or null.
    LogPipeHandler* get_cp(CpType type) const;

    // ---- CP events and crash material

    // Lets the CP's channel react to an event of its supervisor.
    void process_cp_evt(CpType type, CpStateHandler::CpEvent event);

    // Tells subscribed clients about a CP's memory dump, if there is a control server.
    void notify_cp_dump(CpType type, CpDumpEvent event);

    // Saves the CP's mini dump into its storage, named by the time. 0 or negative.
    int save_mini_dump(CpStorage* storage, const tm& time, CpType type);
    // Saves the debug records of the inter-processor communication driver. 0 when every
    // record that could be created was copied, else -1.
    static int save_dipx_dump(CpStorage* storage, const tm& time);

    Multiplexer& multiplexer() { return m_multiplexer; }
    StorageManager& stor_mgr() { return m_stor_mgr; }
    const android::List<LogPipeHandler*>& log_pipes() const { return m_log_pipes; }

private:
    // Looks up the channel's devices and gives them to it. 0 or -1.
    int set_channel_devs(LogPipeHandler* channel);

    LogConfig* m_config = nullptr;
    bool m_save_md = false;
    Multiplexer m_multiplexer;
    std::unique_ptr<ClientManager> m_cli_mgr;
    android::List<LogPipeHandler*> m_log_pipes;
    ModemStateHandler* m_modem_state = nullptr;
    ExtWcnStateHandler* m_wcn_state = nullptr;
    StorageManager m_stor_mgr;
};

#endif  // CONTROL_LOGCONTROLLER_H_
