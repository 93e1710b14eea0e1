// A libqivo with one source, whatever its name, that is made as the variable QIVO_STAND_IN says in words between
// blanks:
//   picture=WxH@N       pictures of that size, N a second; without it there are none
//   sound=RxC           sound of that rate and number of channels; without it there is none
//   resize=MS:WxH       another size from MS milliseconds on
//   rate=MS:R           another rate of sound from then on
//   gone=FROM-TO        nothing comes in that time, and stamps begin anew after it
//   sound-stays         that goes for pictures only
//   unreadable=MS       pictures are of a form that nobody has asked for from then on
//   until=MS            nothing comes any more from then on
//   jitter=MS           pictures come up to so much late, each by another time
//   late=MS             pictures come so much late
//   clock=MS            stamps are the wall clock from then on
//   noise               pictures that cannot be compressed
// Pictures carry the time at which they were due, which is read from the movie again. In the first tenth of each second
// they are white and a tone is heard. Pictures and sound have stamps of different beginnings
// unless these are the wall clock.
#include "sdk/qivo.h"
#include "tools/publish/TimeCode.h"

#include <array>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <random>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

constexpr int kBlocksASecond = 100;
constexpr double kToneFrequency = 1000;
constexpr std::int64_t kUnitsASecond = 10'000'000;
constexpr std::int64_t kPictureStamp = 7'770'000;    // of the first picture
constexpr std::int64_t kSoundStamp = 99'000'000'000; // of the first sound

struct Script {
    int width = 0;
    int height = 0;
    int rate = 0;
    int soundRate = 0;
    int channels = 0;
    long resizeAt = -1;
    int resizedWidth = 0;
    int resizedHeight = 0;
    long rateAt = -1;
    int changedRate = 0;
    long goneFrom = -1;
    long goneTo = -1;
    long until = -1;
    int jitter = 0;
    int late = 0;
    long clockFrom = -1;
    bool noise = false;
    bool soundStays = false;
    long unreadableFrom = -1;
};

Script readScript() {
    const char* text = std::getenv("QIVO_STAND_IN");
    std::istringstream words(text != nullptr ? text : "");
    Script script;
    for (std::string word; words >> word;) {
        const char* form = word.c_str();
        std::sscanf(form, "picture=%dx%d@%d", &script.width, &script.height, &script.rate);
        std::sscanf(form, "sound=%dx%d", &script.soundRate, &script.channels);
        std::sscanf(form, "resize=%ld:%dx%d", &script.resizeAt, &script.resizedWidth, &script.resizedHeight);
        std::sscanf(form, "rate=%ld:%d", &script.rateAt, &script.changedRate);
        std::sscanf(form, "gone=%ld-%ld", &script.goneFrom, &script.goneTo);
        std::sscanf(form, "until=%ld", &script.until);
        std::sscanf(form, "jitter=%d", &script.jitter);
        std::sscanf(form, "late=%d", &script.late);
        std::sscanf(form, "clock=%ld", &script.clockFrom);
        std::sscanf(form, "unreadable=%ld", &script.unreadableFrom);
        script.noise = script.noise || word == "noise";
        script.soundStays = script.soundStays || word == "sound-stays";
    }
    return script;
}

/// The moment that all receivers of the process count from: soon after the first is asked for frames, when the others
/// are as well.
Clock::time_point beginning() {
    static const Clock::time_point instance = Clock::now() + milliseconds(100);
    return instance;
}

std::int64_t wallMs(Clock::time_point time) {
    const auto wall = std::chrono::system_clock::now() + (time - Clock::now());
    return std::chrono::duration_cast<milliseconds>(wall.time_since_epoch()).count();
}

/// That of the beginning, in units of 100 ns.
std::int64_t wallStamp() {
    static const std::int64_t instance = wallMs(beginning()) * (kUnitsASecond / 1000);
    return instance;
}

struct Receiver {
    Script script = readScript();
    bool sound = false;
    std::int64_t number = 0; // of the next frame
    std::minstd_rand random;
    std::vector<std::uint8_t> pixels;
    std::vector<float> samples;

    long msOf(std::int64_t frame) const {
        return static_cast<long>(frame * 1000 / (sound ? kBlocksASecond : script.rate));
    }
    milliseconds lateness() {
        return milliseconds(
            script.late + (script.jitter > 0 ? static_cast<int>(random() % static_cast<unsigned>(script.jitter)) : 0));
    }
    bool comes(long ms) const {
        return ((sound && script.soundStays) || ms < script.goneFrom || ms >= script.goneTo) &&
               (script.until < 0 || ms < script.until);
    }
    /// Counts anew after a break.
    std::int64_t stampOf(std::int64_t frame) const {
        const long ms = msOf(frame);
        if (script.clockFrom >= 0 && ms >= script.clockFrom) {
            return wallStamp() + frame * kUnitsASecond / (sound ? kBlocksASecond : script.rate);
        }
        const std::int64_t begins = sound ? kSoundStamp : kPictureStamp;
        const long from = script.goneTo >= 0 && ms >= script.goneTo ? script.goneTo : 0;
        return begins + frame * kUnitsASecond / (sound ? kBlocksASecond : script.rate) - from * 10'000;
    }
    void fillPicture(int width, int height, Clock::time_point due, bool white);
    void fillSound(int rate, bool tone);
};

void Receiver::fillPicture(int width, int height, Clock::time_point due, bool white) {
    std::vector<std::uint8_t> luma(static_cast<std::size_t>(width) * static_cast<std::size_t>(height),
                                   white ? 235 : 60);
    if (script.noise) {
        for (auto& value : luma) {
            value = static_cast<std::uint8_t>(random() >> 8U);
        }
    }
    qivo::writeTimeCode(luma.data(), width, height, width, wallMs(due));
    pixels.resize(luma.size() * 4);
    for (std::size_t i = 0; i < luma.size(); ++i) {
        std::memset(&pixels[4 * i], luma[i], 4);
    }
}

void Receiver::fillSound(int rate, bool tone) {
    const int count = rate / kBlocksASecond;
    samples.assign(static_cast<std::size_t>(count) * static_cast<std::size_t>(script.channels), 0);
    for (std::size_t i = 0; i < samples.size() && tone; ++i) {
        const auto sample = static_cast<double>(i % static_cast<std::size_t>(count));
        samples[i] = static_cast<float>(0.5 * std::sin(2 * M_PI * kToneFrequency * sample / rate));
    }
}

Receiver* receiverOf(QIVOlib_recv_instance_t handle) {
    return reinterpret_cast<Receiver*>(handle);
}

/// By the script, not by when a busy machine came to run this.
std::int64_t arrival(Clock::time_point arrived) {
    const std::chrono::nanoseconds now = std::chrono::system_clock::now().time_since_epoch();
    return (now - (Clock::now() - arrived)).count() / 100;
}

int32_t giveSound(Receiver& receiver, QIVOlib_audio_frame_v2_t& frame, std::int64_t number, Clock::time_point arrived) {
    const Script& script = receiver.script;
    const long ms = receiver.msOf(number);
    const int rate = script.rateAt >= 0 && ms >= script.rateAt ? script.changedRate : script.soundRate;
    receiver.fillSound(rate, ms % 1000 < 100);
    frame.sample_rate = rate;
    frame.no_channels = script.channels;
    frame.no_samples = rate / kBlocksASecond;
    frame.timecode = receiver.stampOf(number);
    frame.p_data = receiver.samples.data();
    frame.channel_stride_in_bytes = frame.no_samples * static_cast<int32_t>(sizeof(float));
    frame.timestamp = arrival(arrived);
    return QIVOlib_frame_type_audio;
}

int32_t givePicture(Receiver& receiver, QIVOlib_video_frame_v2_t& frame, std::int64_t number, Clock::time_point due,
                    Clock::time_point arrived) {
    const Script& script = receiver.script;
    const long ms = receiver.msOf(number);
    const bool resized = script.resizeAt >= 0 && ms >= script.resizeAt;
    frame.xres = resized ? script.resizedWidth : script.width;
    frame.yres = resized ? script.resizedHeight : script.height;
    receiver.fillPicture(frame.xres, frame.yres, due, ms % 1000 < 100);
    frame.FourCC = 'R' | 'G' << 8 | 'B' << 16 | 'A' << 24;
    if (script.unreadableFrom >= 0 && ms >= script.unreadableFrom) {
        frame.FourCC = 'U' | 'Y' << 8 | 'V' << 16 | 'Y' << 24;
    }
    frame.frame_rate_N = script.rate;
    frame.frame_rate_D = 1;
    frame.picture_aspect_ratio = static_cast<float>(frame.xres) / static_cast<float>(frame.yres);
    frame.frame_format_type = 1;
    frame.timecode = receiver.stampOf(number);
    frame.p_data = receiver.pixels.data();
    frame.line_stride_in_bytes = 4 * frame.xres;
    frame.timestamp = arrival(arrived);
    return QIVOlib_frame_type_video;
}

} // namespace

extern "C" {
bool QIVOlib_initialize(void) {
    return true;
}
void QIVOlib_destroy(void) {}
QIVOlib_find_instance_t QIVOlib_find_create_v2(const QIVOlib_find_create_t*) {
    return nullptr;
}
void QIVOlib_find_destroy(QIVOlib_find_instance_t) {}
bool QIVOlib_find_wait_for_sources(QIVOlib_find_instance_t, uint32_t) {
    return false;
}
const QIVOlib_source_t* QIVOlib_find_get_current_sources(QIVOlib_find_instance_t, uint32_t*) {
    return nullptr;
}
QIVOlib_recv_instance_t QIVOlib_recv_create_v3(const QIVOlib_recv_create_v3_t* settings) {
    auto receiver = std::make_unique<Receiver>();
    receiver->sound = settings->bandwidth == QIVOlib_recv_bandwidth_audio_only;
    return reinterpret_cast<QIVOlib_recv_instance_t>(receiver.release());
}
void QIVOlib_recv_destroy(QIVOlib_recv_instance_t handle) {
    const std::unique_ptr<Receiver> ended(receiverOf(handle));
}
int32_t QIVOlib_recv_capture_v2(QIVOlib_recv_instance_t handle, QIVOlib_video_frame_v2_t* video,
                                QIVOlib_audio_frame_v2_t* audio, QIVOlib_metadata_frame_t*, uint32_t timeout) {
    Receiver& receiver = *receiverOf(handle);
    const Clock::time_point limit = Clock::now() + milliseconds(timeout);
    const int rate = receiver.sound ? kBlocksASecond : receiver.script.rate;
    const bool wanted =
        receiver.sound ? audio != nullptr && receiver.script.soundRate > 0 : video != nullptr && rate > 0;
    while (wanted) {
        const auto due = beginning() + std::chrono::nanoseconds(receiver.number * std::nano::den / rate);
        const auto late = receiver.sound ? milliseconds(0) : receiver.lateness();
        if (due + late > limit) {
            break;
        }
        std::this_thread::sleep_until(due + late);
        const std::int64_t number = receiver.number++;
        if (receiver.comes(receiver.msOf(number))) {
            return receiver.sound ? giveSound(receiver, *audio, number, due + late)
                                  : givePicture(receiver, *video, number, due, due + late);
        }
    }
    std::this_thread::sleep_until(limit);
    return QIVOlib_frame_type_none;
}
void QIVOlib_recv_free_video_v2(QIVOlib_recv_instance_t, const QIVOlib_video_frame_v2_t*) {}
void QIVOlib_recv_free_audio_v2(QIVOlib_recv_instance_t, const QIVOlib_audio_frame_v2_t*) {}
void QIVOlib_recv_free_string(QIVOlib_recv_instance_t, const char*) {}
const char* QIVOlib_recv_get_web_control(QIVOlib_recv_instance_t) {
    return nullptr;
}
void QIVOlib_recv_get_queue(QIVOlib_recv_instance_t, QIVOlib_recv_queue_t*) {}
bool QIVOlib_recv_ptz_is_supported(QIVOlib_recv_instance_t) {
    return false;
}
bool QIVOlib_recv_ptz_zoom_speed(QIVOlib_recv_instance_t, float) {
    return false;
}
bool QIVOlib_recv_ptz_pan_tilt_speed(QIVOlib_recv_instance_t, float, float) {
    return false;
}
bool QIVOlib_recv_ptz_auto_focus(QIVOlib_recv_instance_t) {
    return false;
}
bool QIVOlib_recv_ptz_focus(QIVOlib_recv_instance_t, float) {
    return false;
}
bool QIVOlib_recv_ptz_store_preset(QIVOlib_recv_instance_t, int32_t) {
    return false;
}
bool QIVOlib_recv_ptz_recall_preset(QIVOlib_recv_instance_t, int32_t, float) {
    return false;
}
}
