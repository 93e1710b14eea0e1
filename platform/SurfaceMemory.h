#pragma once

#include "platform/FileDescriptor.h"
#include "platform/Surface.h"

#include <atomic>
#include <cstddef>
#include <mutex>

namespace qivo {

/// Memory shared through a file, mapped for as long as it lives.
class SharedMapping {
  public:
    SharedMapping() = default;
    /// Null memory if the file cannot be mapped, in errno.
    SharedMapping(const FileDescriptor& file, std::size_t bytes, bool writable);
    ~SharedMapping();
    SharedMapping(SharedMapping&& other) noexcept;
    SharedMapping(const SharedMapping&) = delete;
    SharedMapping& operator=(const SharedMapping&) = delete;

    std::byte* memory() const { return _memory; }

  private:
    std::byte* _memory = nullptr;
    std::size_t _bytes = 0;
};

class IOSurface {
  public:
    /// The seals that every surface's file has.
    static const int seals;
    /// The memory of this machine in bytes: no surface is larger.
    static std::uint64_t maximumBytes();
    /// Of a surface with this sound layout, the size of its pixels, up to the next page, and of its whole file, which
    /// is one page more.
    static std::size_t pixelBytes(const SurfaceLayout& layout);
    static std::size_t fileBytes(const SurfaceLayout& layout);

    /// The layout must be sound, and the mapping as large as it asks for. In builds with the address sanitizer, what
    /// lies behind the pixels cannot be touched, save the seed: the system maps whole pages, and would let it pass.
    IOSurface(const SurfaceLayout& layout, FileDescriptor file, SharedMapping mapping, bool writable);
    ~IOSurface();
    IOSurface(const IOSurface&) = delete;
    IOSurface& operator=(const IOSurface&) = delete;

    const SurfaceLayout& layout() const { return _layout; }
    const FileDescriptor& file() const { return _file; }
    std::byte* base() const { return _mapping.memory(); }
    std::uint32_t seed() const;

    IOReturn lock(std::uint32_t options, std::uint32_t* seed);
    IOReturn unlock(std::uint32_t options, std::uint32_t* seed);

  private:
    std::atomic<std::uint32_t>& sharedSeed() const;
    void changeSeed();

    const SurfaceLayout _layout;
    const FileDescriptor _file;
    const SharedMapping _mapping;
    const bool _writable;

    std::mutex _lock;
    std::uint64_t _readers = 0; // under _lock: locks that this process holds
    std::uint64_t _writers = 0; // under _lock
};

} // namespace qivo
