#pragma once

#include "runtime/ChannelOrder.h"
#include "runtime/GstHandles.h"
#include "runtime/SenderClock.h"
#include "runtime/SoundCutter.h"

#include <atomic>
#include <functional>
#include <memory>
#include <string>

namespace qivo::runtime {

/// What takes a stream of sound from its packets to frames. Lives as long as the bin that it was built in, at least
/// until that is in its null state.
///
/// Thread: built on the source's thread; calls on the network's.
class SoundBranch {
  public:
    struct Calls {
        std::function<void(std::unique_ptr<Sound>)> emit;
        std::function<void()> unitComplete;       ///< what the packets began is whole
        std::function<void(std::string)> refused; ///< the sound turned out to be none that is received, and why
    };

    /// The clock, which somebody else keeps right, must live as long.
    SoundBranch(Calls calls, const SenderClock& clock);

    /// Builds everything behind the pad. False if an element is missing. The encoding is one that has a codec.
    bool build(GstBin* bin, GstPad* pad, const std::string& encoding);

  private:
    struct Callbacks;

    void take(GstPad* pad, GstBuffer* buffer);

    const Calls m_calls;
    const SenderClock& m_clock;
    SoundCutter m_cutter;
    ChannelOrder m_order = ChannelOrder::decoder; // set before anything flows
};

} // namespace qivo::runtime
