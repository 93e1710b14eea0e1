#pragma once

#include "tests/platform/TemporaryDirectory.h"
#include "tests/support/Screen.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

namespace qivo::test {

/// A scripted recorder for the model to start, and what it notes. ScriptedRecorder.cpp tells what scripts there are.
class RecorderScript {
  public:
    /// The program's path for a script.
    std::string program(const std::string& script) const {
        std::filesystem::create_symlink(SCRIPTED_RECORDER, m_folder.path(script));
        return m_folder.path(script);
    }

    /// Lets the silent recorder end.
    void release() const { m_folder.write("release", ""); }

    /// The arguments of the last one that was started.
    std::vector<std::string> arguments() const {
        std::ifstream file(m_folder.path("arguments"), std::ios::binary);
        std::vector<std::string> found;
        for (std::string argument; std::getline(file, argument, '\0');) {
            found.push_back(argument);
        }
        return found;
    }

    /// The journal's lines that begin with that word, in order, without it.
    std::vector<std::string> noted(const std::string& word) const {
        std::ifstream file(m_folder.path("journal"));
        std::vector<std::string> found;
        for (std::string line; std::getline(file, line);) {
            if (line.rfind(word, 0) == 0) {
                found.push_back(line.substr(word.size()));
            }
        }
        return found;
    }

    int starts() const { return static_cast<int>(noted("start ").size()); }
    int ends() const { return static_cast<int>(noted("end ").size()); }

    bool waitForStarts(int count) const {
        return eventually([&] { return starts() == count; });
    }

    /// A file of the script's own folder.
    std::string path(const std::string& name) const { return m_folder.path(name); }
    const TemporaryDirectory& folder() const { return m_folder; }

  private:
    TemporaryDirectory m_folder;
};

} // namespace qivo::test
