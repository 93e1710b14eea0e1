#pragma once

#include <unistd.h>

#include <utility>

namespace qivo {

/// Owns an open file descriptor and closes it. -1 stands for none, also after a move.
class FileDescriptor {
  public:
    FileDescriptor() = default;
    explicit FileDescriptor(int number) : m_number(number) {}
    ~FileDescriptor() { reset(); }
    FileDescriptor(FileDescriptor&& other) noexcept : m_number(std::exchange(other.m_number, -1)) {}
    FileDescriptor& operator=(FileDescriptor&& other) noexcept {
        if (this != &other) {
            reset();
            m_number = std::exchange(other.m_number, -1);
        }
        return *this;
    }

    int number() const { return m_number; }
    bool isOpen() const { return m_number >= 0; }
    explicit operator bool() const { return isOpen(); }

    /// Closes it now.
    void reset() {
        if (isOpen()) {
            ::close(std::exchange(m_number, -1));
        }
    }

  private:
    int m_number = -1;
};

} // namespace qivo
