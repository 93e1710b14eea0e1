#include "runtime/Finder.h"

#include <utility>

#include "runtime/LogOnce.h"

namespace qivo::runtime {
namespace {

bool isGiven(const char* text) {
    return text != nullptr && *text != '\0';
}

} // namespace

std::unique_ptr<Finder> Finder::create(const QIVOlib_find_create_t* settings) {
    if (settings != nullptr && isGiven(settings->p_groups)) {
        logOnce("sources are in no groups, so those of all groups are reported");
    }
    if (settings != nullptr && isGiven(settings->p_extra_ips)) {
        logOnce("extra addresses are not asked for sources, only the local network is");
    }
    auto directory = Directory::acquire();
    if (!directory) {
        return nullptr;
    }
    return std::make_unique<Finder>(std::move(directory), settings == nullptr || settings->show_local_sources);
}

Finder::Finder(std::shared_ptr<Directory> directory, bool showLocalSources)
    : m_directory(std::move(directory)), m_showLocalSources(showLocalSources) {}

std::vector<Finder::Entry> Finder::current() const {
    std::vector<Entry> entries;
    for (auto& announcement : m_directory->announcements()) {
        if (m_showLocalSources || !announcement.local) {
            entries.push_back({std::move(announcement.name), std::move(announcement.url)});
        }
    }
    return entries;
}

/// The generation was read before; what has changed since is compared again next time.
bool Finder::report(std::uint64_t generation) {
    const std::lock_guard lock(m_mutex);
    if (m_compared == generation && !m_unreported) {
        return false;
    }
    m_compared = generation;
    auto now = current();
    if (now == m_reported && !m_unreported) {
        return false;
    }
    m_reported = std::move(now);
    m_unreported = false;
    return true;
}

bool Finder::wait(std::chrono::milliseconds timeout) {
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    while (true) {
        const auto seen = m_directory->generation();
        if (m_ended) {
            return false;
        }
        if (report(seen)) {
            return true;
        }
        const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - std::chrono::steady_clock::now());
        if (left.count() <= 0 || !m_directory->waitForChange(seen, left, m_ended)) {
            return false;
        }
    }
}

void Finder::end() {
    m_ended = true;
    m_directory->wakeWaits();
}

const QIVOlib_source_t* Finder::sources(std::uint32_t* count) {
    const std::lock_guard lock(m_mutex);
    m_entries = current();
    m_unreported = m_unreported || m_entries != m_reported;
    m_array.clear();
    for (const auto& entry : m_entries) {
        m_array.push_back({entry.name.c_str(), entry.url.c_str()});
    }
    if (count != nullptr) {
        *count = static_cast<std::uint32_t>(m_array.size());
    }
    return m_array.empty() ? nullptr : m_array.data();
}

} // namespace qivo::runtime
