// SPDX-License-Identifier: Apache-2.0

#include "sim/SimDspDevice.h"

#include <string.h>
#include <sys/stat.h>

#include "sim/device_control.h"

DspControl* SimDspDevice::control() const {
    return reinterpret_cast<DspControl*>(m_control.data());
}

bool SimDspDevice::create(const std::string& root) {
    const std::string node = root + "/" DSP_NODE;
    struct stat st;
    if (!m_log.create(root + "/dev/audio_dsp_log") || !m_pcm.create(root + "/dev/audio_dsp_pcm") ||
        !m_node.create(node) || stat(node.c_str(), &st) != 0 ||
        !m_memory.create(root + "/" DSP_MEMORY, DSP_MEMORY_SIZE) ||
        !m_control.create(root + "/" DSP_CONTROL, sizeof(DspControl))) {
        return false;
    }
    control()->node = {st.st_dev, st.st_ino};
    return true;
}

bool SimDspDevice::crash(const std::vector<uint8_t>& memory) {
    if (memory.empty() || memory.size() > DSP_MEMORY_SIZE || control()->size != 0) {
        return false;
    }
    memcpy(m_memory.data(), memory.data(), memory.size());
    control()->position = 0;
    control()->size = static_cast<uint32_t>(memory.size());
    const uint8_t ready = 1;
    return m_node.feed(&ready, 1) == 1;
}

unsigned SimDspDevice::dumps_taken() const {
    return control()->completed;
}

size_t SimDspDevice::unread() const {
    return control()->unread;
}

unsigned SimDspDevice::wrong_requests() const {
    return control()->wrong;
}
