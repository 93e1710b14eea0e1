#pragma once

#include <unistd.h>
#include <utility>

namespace qivo {

/// A file descriptor that is closed with its owner; negative for none.
class Descriptor {
  public:
    Descriptor() = default;
    explicit Descriptor(int number) : _number(number) {}
    ~Descriptor() {
        if (_number >= 0) {
            ::close(_number);
        }
    }
    Descriptor(Descriptor&& other) noexcept : _number(std::exchange(other._number, -1)) {}
    Descriptor& operator=(Descriptor&& other) noexcept {
        std::swap(_number, other._number);
        return *this;
    }
    Descriptor(const Descriptor&) = delete;
    Descriptor& operator=(const Descriptor&) = delete;

    int number() const { return _number; }
    explicit operator bool() const { return _number >= 0; }

  private:
    int _number = -1;
};

} // namespace qivo
