#include "runtime/RgbaRow.h"

#include <array>
#include <cmath>
#include <cstddef>
#include <cstring>

#ifdef __x86_64__
#include <immintrin.h>
#endif

namespace qivo::runtime {
namespace {

constexpr double kUnit = 64;
constexpr int kShift = 6; // from the unit to levels

} // namespace

RgbaColours RgbaColours::of(double red, double blue, bool fullRange) {
    const double lumaScale = fullRange ? 1 : 255.0 / 219;
    const double scale = kUnit * (fullRange ? 1 : 255.0 / 224);
    const double green = 1 - red - blue;
    const auto rounded = [](double value) { return static_cast<std::int16_t>(std::lround(value)); };
    RgbaColours colours;
    colours.lumaScale = static_cast<std::uint16_t>(std::lround(lumaScale * kUnit * 65536 / 257));
    colours.lumaBias = rounded((fullRange ? 0 : 16 * lumaScale * kUnit) - kUnit / 2);
    colours.redOfV = rounded(2 * (1 - red) * scale);
    colours.greenOfU = rounded(2 * (1 - blue) * blue / green * scale);
    colours.greenOfV = rounded(2 * (1 - red) * red / green * scale);
    colours.blueOfU = rounded(2 * (1 - blue) * scale);
    return colours;
}

#ifdef __x86_64__

namespace {

#define QIVO_INLINE_AVX2 __attribute__((target("avx2"), always_inline)) inline

constexpr int kPixels = 16; // in one step

QIVO_INLINE_AVX2 __m128i load8(const std::uint8_t* bytes) {
    return _mm_loadl_epi64(reinterpret_cast<const __m128i*>(bytes));
}

/// Each of eight twice, one behind the other.
QIVO_INLINE_AVX2 __m256i twice(__m128i values) {
    return _mm256_set_m128i(_mm_unpackhi_epi16(values, values), _mm_unpacklo_epi16(values, values));
}

/// Sums saturate far outside of what can be shown.
QIVO_INLINE_AVX2 void convert16(const RgbaColours& colours, const std::uint8_t* y, const std::uint8_t* u,
                                const std::uint8_t* v, std::uint8_t* rgba) {
    const __m256i bytes = _mm256_cvtepu8_epi16(_mm_loadu_si128(reinterpret_cast<const __m128i*>(y)));
    const __m256i scaled = _mm256_mulhi_epu16(_mm256_or_si256(bytes, _mm256_slli_epi16(bytes, 8)),
                                              _mm256_set1_epi16(static_cast<std::int16_t>(colours.lumaScale)));
    const __m256i luma = _mm256_sub_epi16(scaled, _mm256_set1_epi16(colours.lumaBias));
    const __m128i middle = _mm_set1_epi16(128);
    const __m128i blue = _mm_sub_epi16(_mm_cvtepu8_epi16(load8(u)), middle);
    const __m128i red = _mm_sub_epi16(_mm_cvtepu8_epi16(load8(v)), middle);
    const __m256i toRed = twice(_mm_mullo_epi16(red, _mm_set1_epi16(colours.redOfV)));
    const __m256i toBlue = twice(_mm_mullo_epi16(blue, _mm_set1_epi16(colours.blueOfU)));
    const __m256i fromGreen = twice(_mm_add_epi16(_mm_mullo_epi16(blue, _mm_set1_epi16(colours.greenOfU)),
                                                  _mm_mullo_epi16(red, _mm_set1_epi16(colours.greenOfV))));
    const __m256i r = _mm256_srai_epi16(_mm256_adds_epi16(luma, toRed), kShift);
    const __m256i g = _mm256_srai_epi16(_mm256_subs_epi16(luma, fromGreen), kShift);
    const __m256i b = _mm256_srai_epi16(_mm256_adds_epi16(luma, toBlue), kShift);
    // Within each half of the register: eight of one and eight of the other, then taken in turns.
    const __m256i redBlue = _mm256_packus_epi16(r, b);
    const __m256i greenAlpha = _mm256_packus_epi16(g, _mm256_set1_epi16(255));
    const __m256i redGreen = _mm256_unpacklo_epi8(redBlue, greenAlpha);
    const __m256i blueAlpha = _mm256_unpackhi_epi8(redBlue, greenAlpha);
    const __m256i even = _mm256_unpacklo_epi16(redGreen, blueAlpha); // pixels 0 to 3 and 8 to 11
    const __m256i odd = _mm256_unpackhi_epi16(redGreen, blueAlpha);  // pixels 4 to 7 and 12 to 15
    auto* out = reinterpret_cast<__m256i*>(rgba);
    _mm256_storeu_si256(out, _mm256_permute2x128_si256(even, odd, 0x20));
    _mm256_storeu_si256(out + 1, _mm256_permute2x128_si256(even, odd, 0x31));
}

} // namespace

bool hasRgbaRow() {
    return __builtin_cpu_supports("avx2") != 0;
}

__attribute__((target("avx2"))) void rgbaRow(const RgbaColours& colours, const std::uint8_t* y, const std::uint8_t* u,
                                             const std::uint8_t* v, std::uint8_t* rgba, int width) {
    int x = 0;
    for (; x + kPixels <= width; x += kPixels) {
        convert16(colours, y + x, u + x / 2, v + x / 2, rgba + static_cast<std::ptrdiff_t>(4) * x);
    }
    if (const auto rest = static_cast<std::size_t>(width - x); rest > 0) {
        std::array<std::uint8_t, kPixels> ys{};
        std::array<std::uint8_t, kPixels / 2> us{};
        std::array<std::uint8_t, kPixels / 2> vs{};
        std::array<std::uint8_t, std::size_t{4} * kPixels> pixels;
        std::memcpy(ys.data(), y + x, rest);
        std::memcpy(us.data(), u + x / 2, (rest + 1) / 2);
        std::memcpy(vs.data(), v + x / 2, (rest + 1) / 2);
        convert16(colours, ys.data(), us.data(), vs.data(), pixels.data());
        std::memcpy(rgba + static_cast<std::ptrdiff_t>(4) * x, pixels.data(), 4 * rest);
    }
}

#else

bool hasRgbaRow() {
    return false;
}

void rgbaRow(const RgbaColours& /*colours*/, const std::uint8_t* /*y*/, const std::uint8_t* /*u*/,
             const std::uint8_t* /*v*/, std::uint8_t* /*rgba*/, int /*width*/) {}

#endif

} // namespace qivo::runtime
