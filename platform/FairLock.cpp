#include "platform/FairLock.h"

#include <cassert>

namespace qivo {

void FairLock::lock() {
    std::unique_lock guard(m_mutex);
    if (m_depth == 0 || m_owner != std::this_thread::get_id()) {
        const std::uint64_t ticket = m_nextTicket++;
        m_served.wait(guard, [&] { return m_serving == ticket; });
        m_owner = std::this_thread::get_id();
    }
    ++m_depth;
}

void FairLock::unlock() {
    const std::lock_guard guard(m_mutex);
    assert(m_depth > 0 && m_owner == std::this_thread::get_id());
    if (--m_depth == 0) {
        ++m_serving;
        m_served.notify_all();
    }
}

int FairLock::depth() const {
    const std::lock_guard guard(m_mutex);
    return m_owner == std::this_thread::get_id() ? m_depth : 0;
}

} // namespace qivo
