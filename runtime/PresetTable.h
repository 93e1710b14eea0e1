#pragma once

#include "runtime/OnvifReplies.h"

#include <map>
#include <string>
#include <vector>

namespace qivo::runtime {

/// Which preset of a camera is meant by a number.
///
/// Our own are known by their names, or, as long as the process lives, by the token that the camera answered; some
/// cameras keep no names. What others stored is known by a token that is the number.
///
/// Thread: one at a time.
class PresetTable {
  public:
    /// The name of a preset that we store, e.g. "QIVO 3".
    static std::string nameOf(int number);

    /// What the camera says it has.
    void read(std::vector<onvif::Preset> presets) { m_presets = std::move(presets); }
    /// The camera has answered a token for the number.
    void stored(int number, const std::string& token);
    /// The camera does not know the token any more.
    void forget(const std::string& token);
    /// Whether the camera said that it has the token.
    bool lists(const std::string& token) const;
    /// The token for the number; empty if there is none.
    std::string tokenOf(int number) const;

  private:
    bool isStored(const std::string& token) const;

    std::vector<onvif::Preset> m_presets;
    std::map<int, std::string> m_stored;
};

} // namespace qivo::runtime
