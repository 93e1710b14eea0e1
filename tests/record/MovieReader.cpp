#include "tests/record/MovieReader.h"

#include "tools/publish/TimeCode.h"
#include "tools/record/Handles.h"

#include <gst/app/app.h>
#include <gst/audio/audio.h>
#include <gst/video/video.h>

#include <algorithm>
#include <cmath>
#include <thread>

// GLib holds blocks of its names by pointers into their middle, which the leak checker takes for lost. Programs that
// decode movies do without it.
extern "C" int __lsan_is_turned_off();
extern "C" int __lsan_is_turned_off() {
    return 1;
}

namespace qivo::test {
namespace {

using record::Media;

constexpr double kNanosecond = 1e-9;

double timeOf(GstSample* sample) {
    return static_cast<double>(gst_segment_to_stream_time(gst_sample_get_segment(sample), GST_FORMAT_TIME,
                                                          GST_BUFFER_PTS(gst_sample_get_buffer(sample)))) *
           kNanosecond;
}

void addPicture(DecodedMovie& movie, GstSample* sample) {
    GstVideoInfo info;
    GstVideoFrame frame;
    if (!gst_video_info_from_caps(&info, gst_sample_get_caps(sample)) ||
        !gst_video_frame_map(&frame, &info, gst_sample_get_buffer(sample), GST_MAP_READ)) {
        return;
    }
    movie.width = GST_VIDEO_INFO_WIDTH(&info);
    movie.height = GST_VIDEO_INFO_HEIGHT(&info);
    const auto* luma = static_cast<const std::uint8_t*>(GST_VIDEO_FRAME_PLANE_DATA(&frame, 0));
    const int stride = GST_VIDEO_FRAME_PLANE_STRIDE(&frame, 0);
    DecodedMovie::Picture picture;
    picture.time = timeOf(sample);
    picture.published = readTimeCode(luma, movie.width, movie.height, stride, 1);
    picture.middle = luma[static_cast<std::ptrdiff_t>(movie.height / 2) * stride + movie.width / 2];
    picture.corner = luma[0];
    movie.pictures.push_back(picture);
    gst_video_frame_unmap(&frame);
}

void addSound(DecodedMovie& movie, GstSample* sample) {
    GstAudioInfo info;
    GstMapInfo map;
    if (!gst_audio_info_from_caps(&info, gst_sample_get_caps(sample)) ||
        !gst_buffer_map(gst_sample_get_buffer(sample), &map, GST_MAP_READ)) {
        return;
    }
    movie.rate = GST_AUDIO_INFO_RATE(&info);
    movie.channels = GST_AUDIO_INFO_CHANNELS(&info);
    if (movie.sound.empty()) {
        movie.soundStart = timeOf(sample);
    }
    movie.soundJump = std::max(movie.soundJump, std::abs(timeOf(sample) - movie.soundEnd()));
    const auto* samples = reinterpret_cast<const float*>(map.data);
    for (std::size_t i = 0; i < map.size / sizeof(float); i += static_cast<std::size_t>(movie.channels)) {
        movie.sound.push_back(samples[i]);
    }
    gst_buffer_unmap(gst_sample_get_buffer(sample), &map);
}

/// One kind of a movie's tracks through a pipeline of its own, so that a movie without the other kind is no failure.
template <typename Add>
std::string decode(const std::string& path, const std::string& chain, Add add) {
    const std::string text = "filesrc name=file ! qtdemux name=movie " + chain + " ! appsink name=out sync=false";
    const Media<GstElement> pipeline(gst_parse_launch(text.c_str(), nullptr));
    const Media<GstElement> file(gst_bin_get_by_name(GST_BIN(pipeline.get()), "file"));
    const Media<GstElement> out(gst_bin_get_by_name(GST_BIN(pipeline.get()), "out"));
    g_object_set(file.get(), "location", path.c_str(), nullptr);
    gst_element_set_state(pipeline.get(), GST_STATE_PLAYING);
    const Media<GstBus> bus(gst_element_get_bus(pipeline.get()));
    std::string error;
    while (!gst_app_sink_is_eos(GST_APP_SINK(out.get())) && error.empty()) {
        if (const Media<GstSample> sample{gst_app_sink_try_pull_sample(GST_APP_SINK(out.get()), 100 * GST_MSECOND)}) {
            add(sample.get());
        }
        const Media<GstMessage> message(gst_bus_pop_filtered(bus.get(), GST_MESSAGE_ERROR));
        if (message) {
            GError* reason = nullptr;
            gst_message_parse_error(message.get(), &reason, nullptr);
            const Media<GError> owned(reason);
            error = owned->message;
        }
    }
    gst_element_set_state(pipeline.get(), GST_STATE_NULL);
    return error;
}

} // namespace

DecodedMovie decodeMovie(const std::string& path) {
    gst_init(nullptr, nullptr);
    DecodedMovie movie;
    const std::string pictures =
        decode(path, "movie.video_0 ! queue ! avdec_h264 max-threads=1 ! videoconvert ! video/x-raw,format=GRAY8",
               [&](GstSample* sample) { addPicture(movie, sample); });
    const std::string sound = decode(path, "movie.audio_0 ! queue ! audioconvert ! audio/x-raw,format=F32LE",
                                     [&](GstSample* sample) { addSound(movie, sample); });
    movie.error = !movie.pictures.empty() || movie.sound.empty() ? pictures : "";
    movie.error += !movie.sound.empty() || movie.pictures.empty() ? sound : "";
    movie.readable = movie.error.empty() && (!movie.pictures.empty() || !movie.sound.empty());
    return movie;
}

std::vector<double> flashes(const DecodedMovie& movie) {
    std::vector<double> times;
    for (std::size_t i = 1; i < movie.pictures.size(); ++i) {
        if (movie.pictures[i].middle > 200 && movie.pictures[i - 1].middle < 100) {
            times.push_back(movie.pictures[i].time);
        }
    }
    return times;
}

std::vector<double> tones(const DecodedMovie& movie) {
    std::vector<double> times;
    double loud = -1;
    for (std::size_t i = 0; i < movie.sound.size(); ++i) {
        const double time = movie.soundStart + static_cast<double>(i) / movie.rate;
        if (std::abs(movie.sound[i]) > 0.1F) {
            if (time - loud > 0.2 && i > 0) {
                times.push_back(time);
            }
            loud = time;
        }
    }
    return times;
}

} // namespace qivo::test
