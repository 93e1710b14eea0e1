#include "tests/tools/Publisher.h"

#include <gtest/gtest.h>

#include <sstream>

// GLib holds blocks of its names by pointers into their middle, which the leak checker takes for lost. Leaks of the
// publisher's own objects are looked for in test-publish-parts.
extern "C" int __lsan_is_turned_off();
extern "C" int __lsan_is_turned_off() {
    return 1;
}

namespace qivo::test {

PublishProcess::PublishProcess(const std::vector<std::string>& arguments, std::size_t lines) {
    std::vector<std::string> command{PUBLISH, "--loopback-only", "--port", "0"};
    command.insert(command.end(), arguments.begin(), arguments.end());
    m_process = Process::start(command, {withoutLeakCheck});
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(20);
    while (this->lines().size() < lines && std::chrono::steady_clock::now() < deadline && m_process->running()) {
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
    EXPECT_EQ(this->lines().size(), lines) << m_process->output() << m_process->errors();
}

std::vector<std::string> PublishProcess::lines() const {
    std::vector<std::string> lines;
    std::istringstream text(m_process->output());
    for (std::string line; std::getline(text, line) && !text.eof();) {
        lines.push_back(line);
    }
    return lines;
}

std::string PublishProcess::address(std::size_t number) const {
    const auto all = lines();
    return number < all.size() ? all[number].substr(0, all[number].find(' ')) : "";
}

} // namespace qivo::test
