#include "runtime/PresetTable.h"

#include <algorithm>

namespace qivo::runtime {
namespace {

constexpr std::string_view kOurName = "QIVO ";

bool isOurs(const onvif::Preset& preset) {
    return preset.name.compare(0, kOurName.size(), kOurName) == 0;
}

} // namespace

std::string PresetTable::nameOf(int number) {
    return std::string(kOurName) + std::to_string(number);
}

void PresetTable::stored(int number, const std::string& token) {
    if (!token.empty()) {
        m_stored[number] = token;
    }
}

void PresetTable::forget(const std::string& token) {
    std::erase_if(m_presets, [&](const onvif::Preset& preset) { return preset.token == token; });
    std::erase_if(m_stored, [&](const auto& entry) { return entry.second == token; });
}

bool PresetTable::lists(const std::string& token) const {
    return std::any_of(m_presets.begin(), m_presets.end(),
                       [&](const onvif::Preset& preset) { return preset.token == token; });
}

bool PresetTable::isStored(const std::string& token) const {
    return std::any_of(m_stored.begin(), m_stored.end(), [&](const auto& entry) { return entry.second == token; });
}

std::string PresetTable::tokenOf(int number) const {
    if (const auto it = m_stored.find(number); it != m_stored.end()) {
        return it->second;
    }
    const auto tokenWhere = [this](const auto& holds) {
        const auto it = std::find_if(m_presets.begin(), m_presets.end(), holds);
        return it != m_presets.end() ? it->token : std::string();
    };
    const std::string named =
        tokenWhere([name = nameOf(number)](const onvif::Preset& preset) { return preset.name == name; });
    return !named.empty() ? named : tokenWhere([this, digits = std::to_string(number)](const onvif::Preset& preset) {
        return preset.token == digits && !isOurs(preset) && !isStored(digits);
    });
}

} // namespace qivo::runtime
