#include "tools/publish/page/JsonObject.h"

#include <array>
#include <charconv>
#include <cstdio>

namespace qivo {
namespace {

bool isDigit(char character) {
    return character >= '0' && character <= '9';
}

// A place in the text that moves on over what it could read.
class JsonCursor {
  public:
    explicit JsonCursor(std::string_view text) : m_rest(text) {}

    [[nodiscard]] bool atEnd() {
        skipBlanks();
        return m_rest.empty();
    }

    bool take(std::string_view word) {
        skipBlanks();
        if (m_rest.substr(0, word.size()) != word) {
            return false;
        }
        m_rest.remove_prefix(word.size());
        return true;
    }

    std::optional<std::string> takeText() {
        if (!take("\"")) {
            return std::nullopt;
        }
        std::size_t end = 0;
        while (end < m_rest.size() && m_rest[end] != '"') {
            if (m_rest[end] == '\\' || static_cast<unsigned char>(m_rest[end]) < ' ') {
                return std::nullopt;
            }
            ++end;
        }
        if (end == m_rest.size()) {
            return std::nullopt;
        }
        const std::string text(m_rest.substr(0, end));
        m_rest.remove_prefix(end + 1);
        return text;
    }

    std::optional<JsonValue> takeValue() {
        if (take("true")) {
            return true;
        }
        if (take("false")) {
            return false;
        }
        if (!m_rest.empty() && m_rest.front() == '"') {
            return takeText();
        }
        return takeNumber();
    }

  private:
    std::optional<JsonValue> takeNumber() {
        const std::size_t first = !m_rest.empty() && m_rest.front() == '-' ? 1 : 0;
        if (first >= m_rest.size() || !isDigit(m_rest[first])) {
            return std::nullopt; // what the library would also read: inf, nan, .5
        }
        double value = 0;
        const auto [end, error] = std::from_chars(m_rest.data(), m_rest.data() + m_rest.size(), value);
        if (error != std::errc{}) {
            return std::nullopt;
        }
        m_rest.remove_prefix(static_cast<std::size_t>(end - m_rest.data()));
        return value;
    }

    void skipBlanks() {
        while (!m_rest.empty() && std::string_view(" \t\r\n").find(m_rest.front()) != std::string_view::npos) {
            m_rest.remove_prefix(1);
        }
    }

    std::string_view m_rest;
};

bool takeMember(JsonCursor& cursor, JsonObject& object) {
    const auto name = cursor.takeText();
    if (!name || !cursor.take(":")) {
        return false;
    }
    const auto value = cursor.takeValue();
    return value && object.size() < maximumJsonMembers && object.emplace(*name, *value).second;
}

} // namespace

std::optional<JsonObject> readJsonObject(std::string_view text) {
    JsonCursor cursor(text);
    JsonObject object;
    if (!cursor.take("{")) {
        return std::nullopt;
    }
    if (!cursor.take("}")) {
        do {
            if (!takeMember(cursor, object)) {
                return std::nullopt;
            }
        } while (cursor.take(","));
        if (!cursor.take("}")) {
            return std::nullopt;
        }
    }
    return cursor.atEnd() ? std::optional(object) : std::nullopt;
}

std::string jsonText(std::string_view text) {
    std::string json = "\"";
    for (const char character : text) {
        if (static_cast<unsigned char>(character) < ' ') {
            std::array<char, 8> escape{};
            std::snprintf(escape.data(), escape.size(), "\\u%04x", static_cast<unsigned>(character));
            json += escape.data();
        } else {
            json += character == '"' || character == '\\' ? "\\" : "";
            json += character;
        }
    }
    return json + "\"";
}

} // namespace qivo
