#include "platform/AudioOutput.h"

#include "platform/FallbackAudioOutput.h"
#include "platform/Log.h"
#include "platform/PulseAudioOutput.h"
#include "platform/SdlAudioOutput.h"

#include <mutex>
#include <utility>

namespace qivo {
namespace {

struct Chosen {
    std::mutex mutex; // protects driver
    std::shared_ptr<AudioOutputDriver> driver;
};

Chosen& chosen() {
    static Chosen instance;
    return instance;
}

} // namespace

void AudioOutputDriver::tell(const std::string& line) {
    {
        const std::lock_guard guard(m_mutex);
        if (line == m_told) {
            return;
        }
        m_told = line;
    }
    logLine("%s", line.c_str());
}

void setAudioOutputDriver(std::shared_ptr<AudioOutputDriver> driver) {
    const std::lock_guard guard(chosen().mutex);
    chosen().driver = std::move(driver);
}

std::shared_ptr<AudioOutputDriver> audioOutputDriver() {
    const std::lock_guard guard(chosen().mutex);
    if (!chosen().driver) {
        chosen().driver = std::make_shared<FallbackAudioDriver>(std::make_shared<PulseAudioDriver>(),
                                                                std::make_shared<SdlAudioDriver>());
    }
    return chosen().driver;
}

} // namespace qivo
