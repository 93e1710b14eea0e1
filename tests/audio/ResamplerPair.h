#pragma once

#include "audio/AudioResampler.h"
#include "tests/audio/ReferenceResampler.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <gtest/gtest.h>
#include <memory>
#include <vector>

namespace qivo {

/// The fields of a resampler, in their order.
class AudioResamplerState {
  public:
    static std::int32_t& index(AudioResampler& of) { return of.m_sample_index; }
    static float* samples(AudioResampler& of) { return of.m_last_samples; }
    static float& posn(AudioResampler& of) { return of.m_output_posn; }
    static float& delta(AudioResampler& of) { return of.m_output_delta; }
    static float& scaling(AudioResampler& of) { return of.m_scaling; }
};

} // namespace qivo

/// The same bits, or both not a number: which of two NaNs an operation returns is the compiler's choice.
inline bool sameFloat(float one, float other) {
    return std::bit_cast<std::uint32_t>(one) == std::bit_cast<std::uint32_t>(other) ||
           (std::isnan(one) && std::isnan(other));
}

/// Whether every field has the same bits.
inline bool sameState(const qivo::AudioResampler& one, const qivo::AudioResampler& other) {
    using Bytes = std::array<std::byte, sizeof one>;
    return std::bit_cast<Bytes>(one) == std::bit_cast<Bytes>(other);
}

/// A heap block of exactly the floats that a call may touch, so that a sanitizer sees the first one beyond.
class ExactBuffer {
  public:
    explicit ExactBuffer(const std::vector<float>& values)
        : m_size(values.size()), m_floats(std::make_unique<float[]>(m_size)) {
        std::copy(values.begin(), values.end(), m_floats.get());
    }

    qivo::SampleCursor all() { return {m_floats.get(), m_floats.get() + m_size}; }
    [[nodiscard]] const float* begin() const { return m_floats.get(); }
    [[nodiscard]] const float* end() const { return m_floats.get() + m_size; }
    float* data() { return m_floats.get(); }

  private:
    std::size_t m_size;
    std::unique_ptr<float[]> m_floats;
};

/// Drives the resampler and the reference alike and expects the same to the bit after each call.
class ResamplerPair {
  public:
    using State = qivo::AudioResamplerState;

    qivo::AudioResampler real;
    ReferenceResampler reference;

    void setRates(float from, float to) {
        real.setSourceSampleRate(from, to);
        reference.delta = from / to;
    }
    void setDelta(float delta) { State::delta(real) = reference.delta = delta; }
    void setPosn(float posn) { State::posn(real) = reference.posn = posn; }
    void setScaling(float scaling) { State::scaling(real) = reference.scaling = scaling; }
    void setIndex(std::int32_t index) { State::index(real) = reference.index = index; }
    void reset() {
        real.reset();
        reference.index = -1;
        reference.posn = 0.0F;
        reference.delta = 1.0F;
    }

    struct Outcome {
        int result;
        std::ptrdiff_t taken;   ///< floats that the source cursor moved
        std::ptrdiff_t written; ///< floats that the destination cursor moved
        std::vector<float> dst;
    };

    /// One call of each, on buffers of their own.
    Outcome process(const std::vector<float>& from, const std::vector<float>& into, int srcStride, int dstStride) {
        ExactBuffer src(from);
        ExactBuffer dst(into);
        ExactBuffer expected(into);
        qivo::SampleCursor srcCursor = src.all();
        qivo::SampleCursor dstCursor = dst.all();
        qivo::SampleCursor referenceSrc = src.all();
        qivo::SampleCursor referenceDst = expected.all();
        const int result = real.processSrc(&srcCursor, &dstCursor, srcStride, dstStride);
        EXPECT_EQ(result, reference.process(&referenceSrc, &referenceDst, srcStride, dstStride));
        EXPECT_EQ(srcCursor.position, referenceSrc.position);
        EXPECT_EQ(srcCursor.end, referenceSrc.end);
        EXPECT_EQ(dstCursor.position - dst.begin(), referenceDst.position - expected.begin());
        EXPECT_EQ(dstCursor.end, dst.end());
        expectSameFloats(dst, expected);
        expectSameState();
        return {result, srcCursor.position - src.begin(), dstCursor.position - dst.begin(), {dst.begin(), dst.end()}};
    }

    void expectSameState() {
        EXPECT_EQ(State::index(real), reference.index);
        for (int slot = 0; slot < 4; ++slot) {
            EXPECT_PRED2(sameFloat, State::samples(real)[slot], reference.last[slot]) << "slot " << slot;
        }
        EXPECT_PRED2(sameFloat, State::posn(real), reference.posn);
        EXPECT_PRED2(sameFloat, State::delta(real), reference.delta);
        EXPECT_PRED2(sameFloat, State::scaling(real), reference.scaling);
    }

  private:
    static void expectSameFloats(const ExactBuffer& one, const ExactBuffer& other) {
        const auto [here, there] = std::mismatch(one.begin(), one.end(), other.begin(), other.end(), sameFloat);
        EXPECT_EQ(here, one.end()) << "float " << here - one.begin() << " is " << *here << ", not " << *there;
    }
};
