#include "iq/WcdmaIqManager.h"

#include "channels/LogPipeHandler.h"
#include "core/log.h"

WcdmaIqManager::WcdmaIqManager(LogPipeHandler* channel, LogController* ctrl, Multiplexer* mux)
    : FdHandler(-1, ctrl, mux), m_channel(channel) {}

int WcdmaIqManager::start(CpStorage* /*storage*/) {
    errno = ENOSYS;
    err_log("WCDMA I/Q capture of %s is not supported yet", m_channel->name().string());
    return -1;
}

int WcdmaIqManager::stop() {
    return 0;
}

int WcdmaIqManager::pause() {
    return -1;
}

int WcdmaIqManager::resume() {
    return -1;
}

void WcdmaIqManager::clear_files() {}

void WcdmaIqManager::process(int /*events*/) {}
