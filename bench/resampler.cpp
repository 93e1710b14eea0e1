// The player's use of the resampler against libraries that do the same work: two planes of 1024 samples become one
// buffer of interleaved stereo at 48000 Hz. Prints input samples of both channels a second of processor time, and
// ratios.
//
// Each round runs every contender once for a few milliseconds, starting with another one each time; the ratios are
// medians of the rounds' own, so that a machine that slows down moves both sides alike. A library that can
// do the work in several ways takes part with each of them.

#include "audio/AudioResampler.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <functional>
#include <memory>
#include <samplerate.h>
#include <soxr.h>
#include <speex/speex_resampler.h>
#include <string>
#include <vector>

namespace {

using qivo::AudioResampler;
using qivo::SampleCursor;

constexpr std::ptrdiff_t kFrame = 1024; // samples of one channel
constexpr int kFramesPerRound = 256;    // a few milliseconds
constexpr int kRounds = 101;
constexpr int kRateOut = 48000;
constexpr std::ptrdiff_t kLongestOutput = 8 * kFrame; // samples of one channel

/// What every contender reads and writes: small enough to stay in the cache, as a player's would.
struct Sound {
    std::vector<float> planes = std::vector<float>(2 * kFrame);
    std::vector<float> stereo = std::vector<float>(2 * kLongestOutput + 1); // the right channel's region ends later
    std::vector<float> scratch = std::vector<float>(2 * kLongestOutput);

    Sound() {
        for (std::ptrdiff_t i = 0; i < 2 * kFrame; ++i) {
            planes[i] = 0.5F * std::sin(0.05F * static_cast<float>(i));
        }
    }
};

/// Converts one frame of both planes; returns the output samples of one channel.
using Frame = std::function<int(Sound&)>;

struct Contender {
    std::string name;
    Frame frame;
    std::vector<double> rates = {}; // input samples a second, one a round
};

void require(bool holds, const char* what) {
    if (!holds) {
        std::fprintf(stderr, "bench-resampler: %s\n", what);
        std::exit(1);
    }
}

void scatter(const float* from, float* to, std::ptrdiff_t count) {
    for (std::ptrdiff_t i = 0; i < count; ++i) {
        to[2 * i] = from[i];
    }
}

Frame ours(int rate) {
    auto channels = std::make_shared<std::vector<AudioResampler>>(2);
    return [channels, rate](Sound& sound) {
        int made = 0;
        for (int channel = 0; channel < 2; ++channel) {
            AudioResampler& resampler = (*channels)[channel];
            resampler.setSourceSampleRate(static_cast<float>(rate), static_cast<float>(kRateOut));
            float* plane = sound.planes.data() + channel * kFrame;
            float* out = sound.stereo.data() + channel;
            SampleCursor src{plane, plane + kFrame};
            SampleCursor dst{out, out + 2 * kLongestOutput};
            resampler.processSrc(&src, &dst, 1, 2);
            made = static_cast<int>(dst.position - out) / 2;
        }
        return made;
    };
}

std::shared_ptr<soxr> soxrFor(int rate, unsigned channels, soxr_datatype_t in) {
    const soxr_io_spec_t io = soxr_io_spec(in, SOXR_FLOAT32_I);
    const soxr_quality_spec_t quality = soxr_quality_spec(SOXR_QQ, 0);
    const soxr_runtime_spec_t runtime = soxr_runtime_spec(1);
    soxr_error_t error = nullptr;
    std::shared_ptr<soxr> made(soxr_create(rate, kRateOut, channels, &error, &io, &quality, &runtime), soxr_delete);
    require(error == nullptr, "soxr_create failed");
    return made;
}

/// Planes in, interleaved out: the library does the interleaving.
Frame soxrStereo(int rate) {
    return [soxr = soxrFor(rate, 2, SOXR_FLOAT32_S)](Sound& sound) {
        const float* planes[2] = {sound.planes.data(), sound.planes.data() + kFrame};
        std::size_t taken = 0;
        std::size_t made = 0;
        soxr_process(soxr.get(), static_cast<const void*>(planes), kFrame, &taken, sound.stereo.data(), kLongestOutput,
                     &made);
        return static_cast<int>(made);
    };
}

Frame soxrMono(int rate) {
    auto left = soxrFor(rate, 1, SOXR_FLOAT32_I);
    auto right = soxrFor(rate, 1, SOXR_FLOAT32_I);
    return [left, right](Sound& sound) {
        std::size_t taken = 0;
        std::size_t made = 0;
        for (int channel = 0; channel < 2; ++channel) {
            soxr_process(channel == 0 ? left.get() : right.get(), sound.planes.data() + channel * kFrame, kFrame,
                         &taken, sound.scratch.data(), kLongestOutput, &made);
            scatter(sound.scratch.data(), sound.stereo.data() + channel, static_cast<int>(made));
        }
        return static_cast<int>(made);
    };
}

std::shared_ptr<SpeexResamplerState> speexFor(int rate, unsigned channels) {
    int error = 0;
    std::shared_ptr<SpeexResamplerState> made(speex_resampler_init(channels, rate, kRateOut, 0, &error),
                                              speex_resampler_destroy);
    require(error == RESAMPLER_ERR_SUCCESS, "speex_resampler_init failed");
    return made;
}

/// One state for both channels, writing into every second float by itself.
Frame speexStrided(int rate) {
    auto speex = speexFor(rate, 2);
    speex_resampler_set_output_stride(speex.get(), 2);
    return [speex](Sound& sound) {
        spx_uint32_t made = 0;
        for (unsigned channel = 0; channel < 2; ++channel) {
            spx_uint32_t taken = kFrame;
            made = static_cast<spx_uint32_t>(kLongestOutput);
            speex_resampler_process_float(speex.get(), channel, sound.planes.data() + channel * kFrame, &taken,
                                          sound.stereo.data() + channel, &made);
        }
        return static_cast<int>(made);
    };
}

Frame speexScattered(int rate) {
    return [speex = speexFor(rate, 2)](Sound& sound) {
        spx_uint32_t made = 0;
        for (unsigned channel = 0; channel < 2; ++channel) {
            spx_uint32_t taken = kFrame;
            made = static_cast<spx_uint32_t>(kLongestOutput);
            speex_resampler_process_float(speex.get(), channel, sound.planes.data() + channel * kFrame, &taken,
                                          sound.scratch.data(), &made);
            scatter(sound.scratch.data(), sound.stereo.data() + channel, static_cast<int>(made));
        }
        return static_cast<int>(made);
    };
}

std::shared_ptr<SRC_STATE> linearFor(int channels) {
    int error = 0;
    std::shared_ptr<SRC_STATE> made(src_new(SRC_LINEAR, channels, &error), src_delete);
    require(error == 0, "src_new failed");
    return made;
}

int runLinear(SRC_STATE* state, const float* in, float* out, int rate) {
    SRC_DATA data = {};
    data.data_in = in;
    data.data_out = out;
    data.input_frames = kFrame;
    data.output_frames = kLongestOutput;
    data.src_ratio = static_cast<double>(kRateOut) / rate;
    require(src_process(state, &data) == 0, "src_process failed");
    return static_cast<int>(data.output_frames_gen);
}

Frame linearMono(int rate) {
    auto left = linearFor(1);
    auto right = linearFor(1);
    return [left, right, rate](Sound& sound) {
        int made = 0;
        for (int channel = 0; channel < 2; ++channel) {
            made = runLinear(channel == 0 ? left.get() : right.get(), sound.planes.data() + channel * kFrame,
                             sound.scratch.data(), rate);
            scatter(sound.scratch.data(), sound.stereo.data() + channel, made);
        }
        return made;
    };
}

/// Interleaves first: the library finds each position once for both channels then.
Frame linearStereo(int rate) {
    return [state = linearFor(2), rate](Sound& sound) {
        for (std::ptrdiff_t i = 0; i < kFrame; ++i) {
            sound.scratch[2 * i] = sound.planes[i];
            sound.scratch[2 * i + 1] = sound.planes[kFrame + i];
        }
        return runLinear(state.get(), sound.scratch.data(), sound.stereo.data(), rate);
    };
}

/// What a copy into the same stride costs.
Frame stridedCopy() {
    return [](Sound& sound) {
        scatter(sound.planes.data(), sound.stereo.data(), kFrame);
        scatter(sound.planes.data() + kFrame, sound.stereo.data() + 1, kFrame);
        return int{kFrame};
    };
}

/// Of this thread: time that others spend on the processor does not count.
double processorSeconds() {
    timespec now = {};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
    return static_cast<double>(now.tv_sec) + 1e-9 * static_cast<double>(now.tv_nsec);
}

double runRound(const Frame& frame, Sound& sound) {
    const double start = processorSeconds();
    for (int i = 0; i < kFramesPerRound; ++i) {
        frame(sound);
    }
    return 2.0 * kFrame * kFramesPerRound / (processorSeconds() - start);
}

double median(std::vector<double> values) {
    const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
    std::nth_element(values.begin(), middle, values.end());
    return *middle;
}

/// The first contender's rate over the other's, round by round.
double ratio(const Contender& first, const Contender& other) {
    std::vector<double> ratios;
    ratios.reserve(kRounds);
    for (int i = 0; i < kRounds; ++i) {
        ratios.push_back(first.rates[i] / other.rates[i]);
    }
    return median(std::move(ratios));
}

/// Every contender does the same work: its output is as long as the rates say.
void checkLength(const Contender& contender, int rate, Sound& sound) {
    long made = 0;
    for (int i = 0; i < kFramesPerRound; ++i) {
        made += contender.frame(sound);
    }
    const double expected = static_cast<double>(kFrame) * kFramesPerRound * kRateOut / rate;
    if (std::fabs(static_cast<double>(made) - expected) > 2 * kFrame) {
        std::fprintf(stderr, "bench-resampler: %s made %ld samples, not about %.0f\n", contender.name.c_str(), made,
                     expected);
        std::exit(1);
    }
}

/// Returns the first contender's ratio to the fastest of the others.
double compare(int rate, std::vector<Contender> contenders) {
    Sound sound;
    for (const Contender& contender : contenders) {
        checkLength(contender, rate, sound);
    }
    for (std::size_t round = 0; round < kRounds; ++round) {
        for (std::size_t turn = 0; turn < contenders.size(); ++turn) {
            Contender& contender = contenders[(round + turn) % contenders.size()];
            contender.rates.push_back(runRound(contender.frame, sound));
        }
    }
    std::printf("%d -> %d Hz\n", rate, kRateOut);
    double least = INFINITY;
    for (const Contender& contender : contenders) {
        const double here = ratio(contenders.front(), contender);
        std::printf("  %-38s %8.1f million input samples/s", contender.name.c_str(), median(contender.rates) / 1e6);
        if (&contender != &contenders.front()) {
            std::printf("   resampler is %.2f x", here);
            least = std::min(least, here);
        }
        std::printf("\n");
    }
    std::printf("  resampler to the fastest other: %.2f x\n", least);
    return least;
}

void compareWithLibraries(int rate) {
    compare(rate, {{"AudioResampler (cubic)", ours(rate)},
                   {"soxr quick (cubic), two channels", soxrStereo(rate)},
                   {"soxr quick (cubic), a channel each", soxrMono(rate)},
                   {"speexdsp quality 0, output stride", speexStrided(rate)},
                   {"speexdsp quality 0, then scattered", speexScattered(rate)},
                   {"libsamplerate linear, a channel each", linearMono(rate)},
                   {"libsamplerate linear, interleaved", linearStereo(rate)}});
}

} // namespace

int main() {
    for (const int rate : {44100, 96000, 48001}) {
        compareWithLibraries(rate);
    }
    compare(kRateOut, {{"AudioResampler (pass-through)", ours(kRateOut)}, {"copy into the stride", stridedCopy()}});
    return 0;
}
