#pragma once

#include "runtime/HandleRegistry.h"
#include "runtime/Receiver.h"
#include "sdk/qivo.h"

#include <atomic>
#include <chrono>
#include <memory>
#include <mutex>
#include <utility>

namespace qivo::runtime {

class Finder;

/// What the C operations share: whether the runtime is initialised, and everything that is open.
///
/// Thread: any.
class Library {
  public:
    /// How long the last `destroy` waits for connections to be taken apart.
    static constexpr std::chrono::milliseconds kEndLimit{3000};

    static Library& instance();

    /// Counts; false if GStreamer cannot run or lacks what every receiver needs.
    bool initialize();
    /// Balances one `initialize`; the last ends everything that is open, waits included.
    void destroy();
    bool isInitialized() const { return m_count > 0; }

    /// What a new receiver shares with the others.
    Receiver::Environment receiverEnvironment() const;

    /// The handle of what `make` makes; null where it makes nothing, and where the last `destroy` has come first, which
    /// would not see it: then it is not called.
    template <typename Handle, typename Object, std::uint32_t Tag, typename Make>
    Handle admit(HandleRegistry<Handle, Object, Tag>& registry, const Make& make) {
        const std::lock_guard guard(m_admitting);
        std::shared_ptr<Object> object = isInitialized() ? make() : nullptr;
        return object ? registry.add(std::move(object)) : nullptr;
    }

    HandleRegistry<QIVOlib_recv_instance_t, Receiver, 0xF1520001> receivers;
    HandleRegistry<QIVOlib_find_instance_t, Finder, 0xF1520002> finders;

  private:
    Library() = default;

    std::mutex m_mutex;     // serialises initialize and destroy
    std::mutex m_admitting; // held while something is made and admitted, and while the last destroy takes all out
    std::atomic<int> m_count = 0;
    const std::shared_ptr<TransportMemory> m_transports = std::make_shared<TransportMemory>();
};

} // namespace qivo::runtime
