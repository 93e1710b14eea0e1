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
#include <string>
#include <utility>
#include <vector>

namespace qivo {

/// The fields of a resampler, in their order, and its work by lanes that a test chooses.
class AudioResamplerState {
  public:
    static std::int32_t& index(AudioResampler& of) { return of.m_sample_index; }
    static float* samples(AudioResampler& of) { return of.m_last_samples; }
    static float& posn(AudioResampler& of) { return of.m_output_posn; }
    static float& delta(AudioResampler& of) { return of.m_output_delta; }
    static float& scaling(AudioResampler& of) { return of.m_scaling; }

    static int process(AudioResampler& of, SampleCursor& src, SampleCursor& dst, int srcStride, int dstStride,
                       ResamplerLanes lanes) {
        return of.process(src, dst, srcStride, dstStride, lanes);
    }
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

/// The instruction sets that can be tested here.
inline std::vector<qivo::ResamplerLanes> testableLanes() {
    std::vector<qivo::ResamplerLanes> all = {qivo::ResamplerLanes::One, qivo::ResamplerLanes::Eight,
                                             qivo::ResamplerLanes::Sixteen};
    while (all.back() > qivo::widestResamplerLanes()) {
        all.pop_back();
    }
    return all;
}

/// Drives the resampler and the reference alike and expects the same to the bit after each call; also a resampler for
/// each of the instruction sets.
class ResamplerPair {
  public:
    using State = qivo::AudioResamplerState;

    qivo::AudioResampler real;
    ReferenceResampler reference;

    void setRates(float from, float to) {
        forEach([&](qivo::AudioResampler& each) { each.setSourceSampleRate(from, to); });
        reference.delta = from / to;
    }
    void setDelta(float delta) {
        forEach([&](qivo::AudioResampler& each) { State::delta(each) = delta; });
        reference.delta = delta;
    }
    void setPosn(float posn) {
        forEach([&](qivo::AudioResampler& each) { State::posn(each) = posn; });
        reference.posn = posn;
    }
    void setScaling(float scaling) {
        forEach([&](qivo::AudioResampler& each) { State::scaling(each) = scaling; });
        reference.scaling = scaling;
    }
    void setIndex(std::int32_t index) {
        forEach([&](qivo::AudioResampler& each) { State::index(each) = index; });
        reference.index = index;
    }
    void reset() {
        forEach([](qivo::AudioResampler& each) { each.reset(); });
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
        ExactBuffer expected(into);
        Expected outcome = {0, src.all(), expected.all(), expected};
        outcome.result = reference.process(&outcome.src, &outcome.dst, srcStride, dstStride);
        for (std::size_t i = 0; i < m_lanes.size(); ++i) {
            SCOPED_TRACE("lanes " + std::to_string(i));
            expectSame(outcome, src, into, [&](qivo::SampleCursor& srcCursor, qivo::SampleCursor& dstCursor) {
                return State::process(m_byLanes[i], srcCursor, dstCursor, srcStride, dstStride, m_lanes[i]);
            });
        }
        std::vector<float> made =
            expectSame(outcome, src, into, [&](qivo::SampleCursor& srcCursor, qivo::SampleCursor& dstCursor) {
                return real.processSrc(&srcCursor, &dstCursor, srcStride, dstStride);
            });
        expectSameState();
        return {outcome.result, outcome.src.position - src.begin(), outcome.dst.position - expected.begin(),
                std::move(made)};
    }

    void expectSameState() {
        forEach([this](qivo::AudioResampler& each) { expectSameState(each); });
    }
    void expectSameState(qivo::AudioResampler& of) {
        EXPECT_EQ(State::index(of), reference.index);
        for (int slot = 0; slot < 4; ++slot) {
            EXPECT_PRED2(sameFloat, State::samples(of)[slot], reference.last[slot]) << "slot " << slot;
        }
        EXPECT_PRED2(sameFloat, State::posn(of), reference.posn);
        EXPECT_PRED2(sameFloat, State::delta(of), reference.delta);
        EXPECT_PRED2(sameFloat, State::scaling(of), reference.scaling);
    }

  private:
    struct Expected {
        int result;
        qivo::SampleCursor src;
        qivo::SampleCursor dst;
        const ExactBuffer& floats;
    };

    template <class Call>
    static std::vector<float> expectSame(const Expected& expected, ExactBuffer& src, const std::vector<float>& into,
                                         const Call& call) {
        ExactBuffer dst(into);
        qivo::SampleCursor srcCursor = src.all();
        qivo::SampleCursor dstCursor = dst.all();
        EXPECT_EQ(call(srcCursor, dstCursor), expected.result);
        EXPECT_EQ(srcCursor.position, expected.src.position);
        EXPECT_EQ(srcCursor.end, expected.src.end);
        EXPECT_EQ(dstCursor.position - dst.begin(), expected.dst.position - expected.floats.begin());
        EXPECT_EQ(dstCursor.end, dst.end());
        expectSameFloats(dst, expected.floats);
        return {dst.begin(), dst.end()};
    }

    static void expectSameFloats(const ExactBuffer& one, const ExactBuffer& other) {
        const auto [here, there] = std::mismatch(one.begin(), one.end(), other.begin(), other.end(), sameFloat);
        EXPECT_EQ(here, one.end()) << "float " << here - one.begin() << " is " << *here << ", not " << *there;
    }

    template <class What>
    void forEach(const What& what) {
        what(real);
        for (qivo::AudioResampler& each : m_byLanes) {
            what(each);
        }
    }

    std::vector<qivo::ResamplerLanes> m_lanes = testableLanes();
    std::vector<qivo::AudioResampler> m_byLanes = std::vector<qivo::AudioResampler>(m_lanes.size());
};
