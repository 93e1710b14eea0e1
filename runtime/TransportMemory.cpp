#include "runtime/TransportMemory.h"

#include <algorithm>

namespace qivo::runtime {

bool TransportMemory::needsTcp(const std::string& source) const {
    const std::lock_guard guard(m_mutex);
    return std::find(m_sources.begin(), m_sources.end(), source) != m_sources.end();
}

void TransportMemory::remember(const std::string& source) {
    const std::lock_guard guard(m_mutex);
    if (std::find(m_sources.begin(), m_sources.end(), source) != m_sources.end()) {
        return;
    }
    if (m_sources.size() == kLimit) {
        m_sources.pop_front();
    }
    m_sources.push_back(source);
}

void TransportMemory::forget(const std::string& source) {
    const std::lock_guard guard(m_mutex);
    m_sources.erase(std::remove(m_sources.begin(), m_sources.end(), source), m_sources.end());
}

} // namespace qivo::runtime
