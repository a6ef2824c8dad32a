// The central object of the service. Owns the event loop, the storage manager and one
// log channel per configured CP for the life of the process; brings the service up,
// carries out the control operations and saves the crash material of a CP.
//
// Owned by main(). Everything runs on the loop's thread.
#ifndef CONTROL_LOGCONTROLLER_H_
#define CONTROL_LOGCONTROLLER_H_

#include <time.h>
#include <utils/List.h>

#include "client/CpDumpEvent.h"
#include "config/CpType.h"
#include "config/LogConfig.h"
#include "core/Multiplexer.h"
#include "storage/StorageManager.h"

class CpStorage;
class LogPipeHandler;

class LogController {
public:
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

    // The first channel of that type, or null.
    LogPipeHandler* get_cp(CpType type) const;

    // Tells subscribed clients about a CP's memory dump.
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
    LogConfig* m_config = nullptr;
    bool m_save_md = false;
    Multiplexer m_multiplexer;
    android::List<LogPipeHandler*> m_log_pipes;
    StorageManager m_stor_mgr;
};

#endif  // CONTROL_LOGCONTROLLER_H_
