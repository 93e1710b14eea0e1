#include "tools/record/PlanarRows.h"

#include <array>
#include <cmath>
#include <cstddef>
#include <cstring>

#ifdef __x86_64__
#include <immintrin.h>
#endif

namespace qivo::record {
namespace {

constexpr int unitShift = 15; // from what coefficients count in to levels
constexpr double unit = 1 << unitShift;

} // namespace

PlanarColours PlanarColours::of(double red, double blue) {
    const double luma = unit * 219 / 255;
    const double difference = unit * 224 / 255 / 2;
    const auto rounded = [](double value) { return static_cast<std::int16_t>(std::lround(value)); };
    const auto remaining = [](int sum, int one, int other) { return static_cast<std::int16_t>(sum - one - other); };
    PlanarColours colours;
    colours.redToY = rounded(luma * red);
    colours.blueToY = rounded(luma * blue);
    colours.greenToY = remaining(rounded(luma), colours.redToY, colours.blueToY);
    colours.own = rounded(difference);
    colours.redOffU = rounded(difference * red / (1 - blue));
    colours.greenOffU = remaining(colours.own, colours.redOffU, 0);
    colours.blueOffV = rounded(difference * blue / (1 - red));
    colours.greenOffV = remaining(colours.own, colours.blueOffV, 0);
    return colours;
}

#ifdef __x86_64__

namespace {

#define QIVO_INLINE_AVX2 __attribute__((target("avx2"), always_inline)) inline

constexpr int pixels = 16;   // in one step
constexpr int sumsShift = 3; // differences are of sums of eight pixels, each counted as often as it weighs

/// Of eight pixels, or of sums of such, 16 bits of each: red and blue in turns, green and alpha in turns.
struct Eight {
    __m256i redBlue;
    __m256i greenAlpha;
};

/// What those are multiplied with, and what is added, in 32 bits.
struct Factors {
    __m256i redBlue;
    __m256i greenAlpha;
    __m256i bias;
};

struct Conversion {
    Factors y;
    Factors u;
    Factors v;
};

QIVO_INLINE_AVX2 __m256i inTurns(int even, int odd) {
    return _mm256_unpacklo_epi16(_mm256_set1_epi16(static_cast<std::int16_t>(even)),
                                 _mm256_set1_epi16(static_cast<std::int16_t>(odd)));
}

/// The bias has half a level in it, for rounding.
QIVO_INLINE_AVX2 Factors factors(int red, int green, int blue, int level, int shift) {
    return {inTurns(red, blue), inTurns(green, 0), _mm256_set1_epi32((2 * level + 1) << (shift - 1))};
}

QIVO_INLINE_AVX2 Conversion conversion(const PlanarColours& colours) {
    constexpr int shift = unitShift + sumsShift;
    return {factors(colours.redToY, colours.greenToY, colours.blueToY, 16, unitShift),
            factors(-colours.redOffU, -colours.greenOffU, colours.own, 128, shift),
            factors(colours.own, -colours.greenOffV, -colours.blueOffV, 128, shift)};
}

QIVO_INLINE_AVX2 Eight apart(__m256i bytes) {
    return {_mm256_and_si256(bytes, _mm256_set1_epi16(255)), _mm256_srli_epi16(bytes, 8)};
}

QIVO_INLINE_AVX2 Eight load8(const std::uint8_t* rgba) {
    return apart(_mm256_loadu_si256(reinterpret_cast<const __m256i*>(rgba)));
}

QIVO_INLINE_AVX2 Eight eightOf(const std::uint8_t* rgba) {
    int bytes = 0;
    std::memcpy(&bytes, rgba, sizeof bytes);
    return apart(_mm256_set1_epi32(bytes));
}

QIVO_INLINE_AVX2 Eight sum(const Eight& one, const Eight& other) {
    return {_mm256_add_epi16(one.redBlue, other.redBlue), _mm256_add_epi16(one.greenAlpha, other.greenAlpha)};
}

/// Each pixel's left neighbour. The first one's is the first of `before`, which then gets the neighbour of what
/// follows.
QIVO_INLINE_AVX2 __m256i leftOf(__m256i values, __m256i& before) {
    const __m256i turned = _mm256_permutevar8x32_epi32(values, _mm256_setr_epi32(7, 0, 1, 2, 3, 4, 5, 6));
    const __m256i left = _mm256_blend_epi32(turned, before, 1);
    before = turned;
    return left;
}

/// Added to its left neighbour each: of a pair the even one is then there twice, and its neighbours once.
QIVO_INLINE_AVX2 Eight withLeft(const Eight& values, Eight& before) {
    return sum(values, {leftOf(values.redBlue, before.redBlue), leftOf(values.greenAlpha, before.greenAlpha)});
}

/// The sums of pairs: numbers 0, 1, 4, 5, 2, 3, 6, 7. No half of a 32-bit number is large enough to reach the other.
QIVO_INLINE_AVX2 Eight pairs(const Eight& first, const Eight& second) {
    return {_mm256_hadd_epi32(first.redBlue, second.redBlue), _mm256_hadd_epi32(first.greenAlpha, second.greenAlpha)};
}

template <int shift>
QIVO_INLINE_AVX2 __m256i weigh(const Eight& values, const Factors& by) {
    const __m256i products = _mm256_add_epi32(_mm256_madd_epi16(values.redBlue, by.redBlue),
                                              _mm256_madd_epi16(values.greenAlpha, by.greenAlpha));
    return _mm256_srai_epi32(_mm256_add_epi32(products, by.bias), shift);
}

QIVO_INLINE_AVX2 void convert16(const Conversion& by, Eight& before, const std::uint8_t* top,
                                const std::uint8_t* bottom, const PlanarPlace& place) {
    const Eight top0 = load8(top);
    const Eight top1 = load8(top + std::ptrdiff_t{4} * pixels / 2);
    const Eight bottom0 = load8(bottom);
    const Eight bottom1 = load8(bottom + std::ptrdiff_t{4} * pixels / 2);
    // Packed within each half of the register: four of the first and four of the second, top before bottom.
    const __m256i topY = _mm256_packs_epi32(weigh<unitShift>(top0, by.y), weigh<unitShift>(top1, by.y));
    const __m256i bottomY = _mm256_packs_epi32(weigh<unitShift>(bottom0, by.y), weigh<unitShift>(bottom1, by.y));
    const __m256i luma =
        _mm256_permutevar8x32_epi32(_mm256_packus_epi16(topY, bottomY), _mm256_setr_epi32(0, 4, 1, 5, 2, 6, 3, 7));
    _mm_storeu_si128(reinterpret_cast<__m128i*>(place.topY), _mm256_castsi256_si128(luma));
    _mm_storeu_si128(reinterpret_cast<__m128i*>(place.bottomY), _mm256_extracti128_si256(luma, 1));

    const Eight first = withLeft(sum(top0, bottom0), before);
    const Eight second = withLeft(sum(top1, bottom1), before);
    const Eight sums = pairs(first, second);
    const __m256i differences =
        _mm256_packs_epi32(weigh<unitShift + sumsShift>(sums, by.u), weigh<unitShift + sumsShift>(sums, by.v));
    const __m256i bytes = _mm256_packus_epi16(differences, differences);
    const __m128i inOrder = _mm_unpacklo_epi16(_mm256_castsi256_si128(bytes), _mm256_extracti128_si256(bytes, 1));
    _mm_storel_epi64(reinterpret_cast<__m128i*>(place.u), inOrder);
    _mm_storel_epi64(reinterpret_cast<__m128i*>(place.v), _mm_unpackhi_epi64(inOrder, inOrder));
}

/// Fewer pixels, and behind the last one another that looks like it.
QIVO_INLINE_AVX2 void convertRest(const Conversion& by, Eight& before, const std::uint8_t* top,
                                  const std::uint8_t* bottom, const PlanarPlace& place, std::size_t rest) {
    std::array<std::uint8_t, std::size_t{4} * pixels> tops{};
    std::array<std::uint8_t, std::size_t{4} * pixels> bottoms{};
    std::array<std::uint8_t, pixels> topYs;
    std::array<std::uint8_t, pixels> bottomYs;
    std::array<std::uint8_t, pixels / 2> us;
    std::array<std::uint8_t, pixels / 2> vs;
    std::memcpy(tops.data(), top, 4 * rest);
    std::memcpy(tops.data() + 4 * rest, top + 4 * (rest - 1), 4);
    std::memcpy(bottoms.data(), bottom, 4 * rest);
    std::memcpy(bottoms.data() + 4 * rest, bottom + 4 * (rest - 1), 4);
    convert16(by, before, tops.data(), bottoms.data(), {topYs.data(), bottomYs.data(), us.data(), vs.data()});
    std::memcpy(place.topY, topYs.data(), rest);
    std::memcpy(place.bottomY, bottomYs.data(), rest);
    std::memcpy(place.u, us.data(), (rest + 1) / 2);
    std::memcpy(place.v, vs.data(), (rest + 1) / 2);
}

} // namespace

bool hasPlanarRows() {
    return __builtin_cpu_supports("avx2") != 0;
}

__attribute__((target("avx2"))) void planarRows(const PlanarColours& colours, const std::uint8_t* top,
                                                const std::uint8_t* bottom, const PlanarPlace& place, int width) {
    const Conversion by = conversion(colours);
    Eight before = sum(eightOf(top), eightOf(bottom));
    std::ptrdiff_t x = 0;
    const auto at = [&] { return PlanarPlace{place.topY + x, place.bottomY + x, place.u + x / 2, place.v + x / 2}; };
    for (; x + pixels <= width; x += pixels) {
        convert16(by, before, top + 4 * x, bottom + 4 * x, at());
    }
    if (const auto rest = static_cast<std::size_t>(width - x); rest > 0) {
        convertRest(by, before, top + 4 * x, bottom + 4 * x, at(), rest);
    }
}

#else

bool hasPlanarRows() {
    return false;
}

void planarRows(const PlanarColours& /*colours*/, const std::uint8_t* /*top*/, const std::uint8_t* /*bottom*/,
                const PlanarPlace& /*place*/, int /*width*/) {}

#endif

} // namespace qivo::record
