#include "tools/publish/Names.h"

#include <cstdint>
#include <optional>

namespace qivo {
namespace {

// Takes one character off the text; nothing if it is malformed.
std::optional<char32_t> takeCharacter(std::string_view& text) {
    const auto first = static_cast<unsigned char>(text.front());
    const std::size_t length = first < 0x80 ? 1 : first < 0xC2 ? 0 : first < 0xE0 ? 2 : first < 0xF0 ? 3 : 4;
    if (length == 0 || first > 0xF4 || text.size() < length) {
        return std::nullopt;
    }
    char32_t character = length == 1 ? first : first & (0x7FU >> length);
    for (std::size_t i = 1; i < length; ++i) {
        const auto next = static_cast<unsigned char>(text[i]);
        if ((next & 0xC0) != 0x80) {
            return std::nullopt;
        }
        character = character << 6 | (next & 0x3F);
    }
    const bool overlong = (length == 3 && character < 0x800) || (length == 4 && character < 0x10000);
    if (overlong || character > 0x10FFFF || (character >= 0xD800 && character < 0xE000)) {
        return std::nullopt;
    }
    text.remove_prefix(length);
    return character;
}

std::string textProblem(std::string_view option, std::string_view text) {
    if (text.empty()) {
        return std::string(option) + ": the name is empty; give one";
    }
    if (!isUtf8(text)) {
        return std::string(option) + ": the name is not valid UTF-8; check the terminal's or script's encoding";
    }
    if (hasControlCharacter(text)) {
        return std::string(option) + ": the name holds a control character; leave it out";
    }
    return {};
}

} // namespace

bool isUtf8(std::string_view text) {
    while (!text.empty()) {
        if (!takeCharacter(text)) {
            return false;
        }
    }
    return true;
}

bool hasControlCharacter(std::string_view text) {
    while (!text.empty()) {
        const auto character = takeCharacter(text);
        if (!character) {
            return false;
        }
        if (*character < 0x20 || (*character >= 0x7F && *character < 0xA0)) {
            return true;
        }
    }
    return false;
}

std::string instanceName(std::string_view machine, std::string_view source) {
    return std::string(machine) + " (" + std::string(source) + ")";
}

std::string machineNameProblem(std::string_view machine) {
    if (std::string problem = textProblem("--machine", machine); !problem.empty()) {
        return problem;
    }
    if (machine.find(" (") != std::string_view::npos) {
        return "--machine \"" + std::string(machine) +
               "\": viewers take what stands before the first \" (\" of a name as the machine; leave \" (\" out";
    }
    return {};
}

std::string sourceNameProblem(std::string_view machine, std::string_view source) {
    if (std::string problem = textProblem("--source", source); !problem.empty()) {
        return problem;
    }
    const std::string name = instanceName(machine, source);
    if (name.size() > maximumInstanceNameBytes) {
        return "\"" + name + "\" is too long to be announced: " + std::to_string(name.size()) + " bytes, at most " +
               std::to_string(maximumInstanceNameBytes) + "; shorten --machine or --source";
    }
    return {};
}

std::string_view cutUtf8(std::string_view text, std::size_t bytes) {
    if (text.size() <= bytes) {
        return text;
    }
    while (bytes > 0 && (static_cast<unsigned char>(text[bytes]) & 0xC0) == 0x80) {
        --bytes;
    }
    return text.substr(0, bytes);
}

std::string alternativeInstanceName(std::string_view machine, std::string_view source, int attempt) {
    const std::string number = " #" + std::to_string(attempt);
    const std::string_view kept = cutUtf8(machine, maximumInstanceNameBytes - instanceName("", number).size());
    const std::size_t room = maximumInstanceNameBytes - instanceName(kept, number).size();
    return instanceName(kept, std::string(cutUtf8(source, room)) + number);
}

} // namespace qivo
