#pragma once

#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <variant>

namespace qivo {

using JsonValue = std::variant<double, bool, std::string>;

/** A JSON object of numbers, truth values and plain texts. */
using JsonObject = std::map<std::string, JsonValue>;

inline constexpr std::size_t maximumJsonMembers = 16;

/** Reads one; stricter than JSON: nothing nested, no null, no name twice, no backslash in a text, and nothing before or
 *  behind but blanks. Null for everything else. */
[[nodiscard]] std::optional<JsonObject> readJsonObject(std::string_view text);

/** The member of that name and type; null if there is none. */
template <typename T>
[[nodiscard]] std::optional<T> member(const JsonObject& object, const std::string& name) {
    const auto found = object.find(name);
    const T* value = found == object.end() ? nullptr : std::get_if<T>(&found->second);
    return value != nullptr ? std::optional<T>(*value) : std::nullopt;
}

/** A text as JSON, with its quotation marks. */
[[nodiscard]] std::string jsonText(std::string_view text);

} // namespace qivo
