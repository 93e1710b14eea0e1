#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <utility>
#include <vector>

namespace qivo::runtime {

/// Handles that can be checked: numbers that stand for objects, never addresses of them.
///
/// `Handle` is a pointer type of the C interface. Its value is `Tag` in the upper half and a count in the lower, which
/// is no address that a program can own, so a stray pointer, a handle of another kind and a handle that has ended all
/// miss. A number comes again after four thousand million handles.
///
/// Thread: any. Objects end outside the lock.
template <typename Handle, typename Object, std::uint32_t Tag>
class HandleRegistry {
  public:
    Handle add(std::shared_ptr<Object> object) {
        const std::lock_guard guard(m_mutex);
        std::uint64_t id = 0;
        do {
            id = (static_cast<std::uint64_t>(Tag) << 32) | ++m_count;
        } while (m_objects.count(id) != 0);
        m_objects.emplace(id, std::move(object));
        return reinterpret_cast<Handle>(static_cast<std::uintptr_t>(id));
    }

    /// Null if the handle is refused.
    std::shared_ptr<Object> find(Handle handle) const {
        const std::lock_guard guard(m_mutex);
        const auto it = m_objects.find(reinterpret_cast<std::uintptr_t>(handle));
        return it != m_objects.end() ? it->second : nullptr;
    }

    /// Takes the object out; null if the handle is refused.
    std::shared_ptr<Object> remove(Handle handle) {
        const std::lock_guard guard(m_mutex);
        const auto it = m_objects.find(reinterpret_cast<std::uintptr_t>(handle));
        if (it == m_objects.end()) {
            return nullptr;
        }
        std::shared_ptr<Object> object = std::move(it->second);
        m_objects.erase(it);
        return object;
    }

    /// Takes every object out.
    std::vector<std::shared_ptr<Object>> removeAll() {
        std::map<std::uint64_t, std::shared_ptr<Object>> taken;
        {
            const std::lock_guard guard(m_mutex);
            taken.swap(m_objects);
        }
        std::vector<std::shared_ptr<Object>> objects;
        objects.reserve(taken.size());
        for (auto& entry : taken) {
            objects.push_back(std::move(entry.second));
        }
        return objects;
    }

  private:
    static_assert(sizeof(std::uintptr_t) == sizeof(std::uint64_t), "handles need 64 bits");

    mutable std::mutex m_mutex; // protects the rest
    std::map<std::uint64_t, std::shared_ptr<Object>> m_objects;
    std::uint32_t m_count = 0;
};

} // namespace qivo::runtime
