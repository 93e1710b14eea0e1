#include "runtime/PacketGuard.h"

#include <array>
#include <sys/socket.h>
#include <utility>

#include "runtime/Announcement.h"

namespace qivo::runtime {
namespace {

constexpr std::uint16_t kTypeA = 1;
constexpr std::uint16_t kTypeCname = 5;
constexpr std::uint16_t kTypePtr = 12;
constexpr std::uint16_t kTypeTxt = 16;
constexpr std::uint16_t kTypeAaaa = 28;
constexpr std::uint16_t kTypeSrv = 33;
constexpr std::uint16_t kTypeDname = 39;
constexpr std::size_t kMaxNameWireBytes = 255;
constexpr int kMaxRefusalsAtOnce = 64;

/// Reads a message from front to end; everything fails for good at the first thing that is not well-formed.
class Reader {
  public:
    Reader(const std::uint8_t* data, std::size_t size) : m_data(data), m_size(size) {}

    bool failed() const { return m_failed; }
    std::size_t position() const { return m_position; }

    std::uint16_t number() {
        if (!has(2)) {
            return 0;
        }
        const auto value = static_cast<std::uint16_t>((m_data[m_position] << 8U) | m_data[m_position + 1]);
        m_position += 2;
        return value;
    }

    void skip(std::size_t count) { m_position += has(count) ? count : 0; }

    DomainName name() {
        DomainName labels;
        std::size_t at = m_position;
        std::size_t bytes = 1;
        bool jumped = false;
        while (!m_failed) {
            const std::size_t length = at < m_size ? m_data[at] : 0xffU;
            if (length == 0) {
                m_position = jumped ? m_position : at + 1;
                return labels;
            }
            if (length >= 0xc0 && at + 1 < m_size) {
                const std::size_t target = ((length & 0x3fU) << 8U) | m_data[at + 1];
                m_position = jumped ? m_position : at + 2;
                jumped = true;
                m_failed = target >= at; // only backwards, so that there is an end
                at = target;
                continue;
            }
            bytes += length + 1;
            m_failed = length > kMaxNameBytes || at + 1 + length > m_size || bytes > kMaxNameWireBytes;
            if (!m_failed) {
                labels.push_back(foldCase({reinterpret_cast<const char*>(m_data) + at + 1, length}));
                m_failed = labels.back().find('\0') != std::string::npos;
            }
            at += length + 1;
        }
        return {};
    }

  private:
    bool has(std::size_t count) {
        m_failed = m_failed || m_size - m_position < count;
        return !m_failed;
    }

    const std::uint8_t* m_data;
    std::size_t m_size;
    std::size_t m_position = 0;
    bool m_failed = false;
};

struct Record {
    DomainName owner;
    std::uint16_t type = 0;
    DomainName target; // of PTR and SRV
};

Record readRecord(Reader& reader) {
    Record record;
    record.owner = reader.name();
    record.type = reader.number();
    reader.skip(6); // class, time to live
    const std::size_t length = reader.number();
    const std::size_t start = reader.position();
    if (record.type == kTypePtr || record.type == kTypeSrv) {
        reader.skip(record.type == kTypeSrv ? 6 : 0);
        record.target = reader.name();
        // A target that goes on behind the record's end makes the next record start in the wrong place.
        reader.skip(start + length >= reader.position() ? start + length - reader.position() : SIZE_MAX);
    } else {
        reader.skip(length);
    }
    return record;
}

bool isServiceType(const DomainName& name, std::size_t from) {
    return name.size() == from + 3 && foldCase(name[from]) == "_rtsp" && foldCase(name[from + 1]) == "_tcp" &&
           foldCase(name[from + 2]) == "local";
}

/// The byte that an escape stands for; `at` is behind the backslash and moves on.
std::optional<char> readEscape(std::string_view text, std::size_t& at) {
    if (at >= text.size()) {
        return std::nullopt;
    }
    const auto digit = [&](std::size_t i) { return i < text.size() && text[i] >= '0' && text[i] <= '9'; };
    if (!digit(at)) {
        return text[at++];
    }
    if (!digit(at + 1) || !digit(at + 2)) {
        return std::nullopt;
    }
    const int value = (text[at] - '0') * 100 + (text[at + 1] - '0') * 10 + (text[at + 2] - '0');
    at += 3;
    return value > 0 && value < 256 ? std::optional(static_cast<char>(value)) : std::nullopt;
}

} // namespace

std::optional<DomainName> parseEscapedName(std::string_view text) {
    DomainName labels{""};
    for (std::size_t at = 0; at < text.size();) {
        const char c = text[at++];
        if (c == '.') {
            labels.emplace_back();
            continue;
        }
        const auto byte = c == '\\' ? readEscape(text, at) : std::optional(c);
        if (!byte) {
            return std::nullopt;
        }
        labels.back() += *byte;
    }
    for (const auto& label : labels) {
        if (label.empty() || label.size() > kMaxNameBytes) {
            return std::nullopt;
        }
    }
    return labels;
}

std::optional<std::string> instanceOf(const DomainName& name) {
    return isServiceType(name, 1) ? std::optional(name.front()) : std::nullopt;
}

PacketGuard::PacketGuard(Interests interests) : m_interests(std::move(interests)) {}

bool PacketGuard::admits(const std::uint8_t* data, std::size_t size) const {
    Reader reader(data, size);
    reader.skip(2);
    constexpr std::uint16_t kResponse = 0x8000;
    constexpr std::uint16_t kKindAndErrors = 0xf80f;
    const bool response = (reader.number() & kKindAndErrors) == kResponse;
    const int questions = reader.number();
    const int answers = reader.number();
    const int authorities = reader.number();
    const int additional = reader.number();
    if (reader.failed() || size > kMaxPacketBytes || !response || questions != 0 || authorities != 0 || answers == 0) {
        return false;
    }
    bool interesting = false;
    for (int i = 0; i < answers + additional; ++i) {
        const Record record = readRecord(reader);
        if (reader.failed() || record.type == kTypeCname || record.type == kTypeDname) {
            return false;
        }
        if (record.type == kTypePtr && isServiceType(record.owner, 0)) {
            const auto instance = instanceOf(record.target);
            if (!instance || !m_interests.service(*instance)) {
                return false;
            }
            interesting = true;
        } else if (record.type == kTypeSrv || record.type == kTypeTxt) {
            interesting = interesting || instanceOf(record.owner).has_value();
        } else if (record.type == kTypeA || record.type == kTypeAaaa) {
            interesting = interesting || m_interests.host(record.owner);
        }
    }
    return interesting;
}

bool PacketGuard::clear(int socket) const {
    std::array<std::uint8_t, kMaxPacketBytes> buffer{};
    for (int refused = 0; refused < kMaxRefusalsAtOnce; ++refused) {
        const auto size = recv(socket, buffer.data(), buffer.size(), MSG_PEEK | MSG_DONTWAIT | MSG_TRUNC);
        if (size < 0) {
            return false;
        }
        const auto bytes = static_cast<std::size_t>(size);
        if (bytes <= buffer.size() && admits(buffer.data(), bytes)) {
            return true;
        }
        recv(socket, buffer.data(), buffer.size(), MSG_DONTWAIT);
    }
    return false;
}

} // namespace qivo::runtime
