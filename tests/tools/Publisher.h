#pragma once

#include "tests/support/Process.h"

#include <memory>
#include <string>
#include <vector>

namespace qivo::test {

/// Environment of a sanitized program that is started here; see Publisher.cpp.
inline constexpr const char* withoutLeakCheck = "ASAN_OPTIONS=detect_leaks=0";

/// The real qivo-publish, serving on loopback at a port of its own choice.
class PublishProcess {
  public:
    /// Starts it with these arguments and waits until it has printed `lines` addresses.
    explicit PublishProcess(const std::vector<std::string>& arguments, std::size_t lines = 2);

    /// The address in line `number`, counted from 0; empty if there is none.
    [[nodiscard]] std::string address(std::size_t number) const;
    [[nodiscard]] std::vector<std::string> lines() const;
    [[nodiscard]] std::string errors() const { return m_process->errors(); }
    Process& process() { return *m_process; }

  private:
    std::unique_ptr<Process> m_process;
};

} // namespace qivo::test
