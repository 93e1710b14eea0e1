#pragma once

#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <string_view>
#include <vector>

namespace qivo::record {

/** Builds the atoms of a QuickTime movie, numbers big-endian. */
class AtomWriter {
  public:
    void u8(std::uint8_t value) { m_bytes.push_back(value); }
    void u16(std::uint16_t value) { number(value, 2); }
    void u32(std::uint32_t value) { number(value, 4); }
    void u64(std::uint64_t value) { number(value, 8); }
    void f64(double value) { u64(std::bit_cast<std::uint64_t>(value)); }
    /** A number with 16 bits before and 16 behind the point. */
    void fixed(std::uint32_t whole) { u32(whole << 16); }
    void zeros(std::size_t count) { m_bytes.resize(m_bytes.size() + count); }
    void text(std::string_view characters) { m_bytes.insert(m_bytes.end(), characters.begin(), characters.end()); }
    void bytes(const std::vector<std::uint8_t>& data) { m_bytes.insert(m_bytes.end(), data.begin(), data.end()); }

    /** An atom whose content `fill` writes. `type` has four characters. */
    template <typename Fill>
    void atom(std::string_view type, Fill fill) {
        const std::size_t start = m_bytes.size();
        u32(0);
        text(type);
        fill();
        setU32(start, static_cast<std::uint32_t>(m_bytes.size() - start));
    }

    /** An atom that begins with a version and 24 bits of flags. */
    template <typename Fill>
    void fullAtom(std::string_view type, std::uint8_t version, std::uint32_t flags, Fill fill) {
        atom(type, [&] {
            u32(static_cast<std::uint32_t>(version) << 24 | flags);
            fill();
        });
    }

    /** Replaces the four bytes at `place`, which have been written. */
    void setU32(std::size_t place, std::uint32_t value) {
        for (std::size_t i = 0; i < 4; ++i) {
            m_bytes[place + i] = static_cast<std::uint8_t>(value >> (24 - 8 * i));
        }
    }

    [[nodiscard]] std::size_t size() const { return m_bytes.size(); }
    [[nodiscard]] const std::vector<std::uint8_t>& data() const { return m_bytes; }

  private:
    void number(std::uint64_t value, std::size_t count) {
        // At once: an index has millions of them.
        std::array<std::uint8_t, sizeof(value)> bytes{};
        for (std::size_t i = 0; i < count; ++i) {
            bytes[i] = static_cast<std::uint8_t>(value >> (8 * (count - 1 - i)));
        }
        m_bytes.insert(m_bytes.end(), bytes.begin(), bytes.begin() + static_cast<std::ptrdiff_t>(count));
    }

    std::vector<std::uint8_t> m_bytes;
};

} // namespace qivo::record
