#include "tools/publish/Stream.h"

#include "tools/publish/Feeder.h"
#include "tools/publish/SoundFeeder.h"

#include <algorithm>
#include <cmath>
#include <gst/video/video.h>

namespace qivo {
namespace {

constexpr const char* feederKey = "qivo-feeder";
constexpr const char* soundFeederKey = "qivo-sound-feeder";
constexpr guint64 reportInterval = 500 * GST_MSECOND;

// A key picture a second: whoever misses a packet sees a whole picture again within that time.
int keyInterval(PictureRate rate) {
    return std::max(1, rate.numerator / rate.denominator);
}

// One thread costs the least in all; a picture too large for it takes as many as there are processors.
int encoderThreads(const PictureFormat& format) {
    constexpr double pixelsASecondForOneThread = 1920.0 * 1080 * 60;
    const double pixels =
        1.0 * format.size.width * format.size.height * format.rate.numerator / format.rate.denominator;
    return pixels <= pixelsASecondForOneThread ? 1 : 0;
}

std::string h264Pipeline(const PictureFormat& format) {
    return "x264enc name=encoder tune=zerolatency speed-preset=ultrafast bframes=0 sliced-threads=false threads=" +
           std::to_string(encoderThreads(format)) + " bitrate=" + std::to_string(bitRateFor(format)) +
           " key-int-max=" + std::to_string(keyInterval(format.rate)) +
           " ! video/x-h264,profile=constrained-baseline,stream-format=byte-stream"
           " ! rtph264pay name=pay0 pt=96 config-interval=-1 aggregate-mode=zero-latency";
}

std::string h265Pipeline(const PictureFormat& format) {
    return "x265enc name=encoder tune=zerolatency speed-preset=ultrafast log-level=none bitrate=" +
           std::to_string(bitRateFor(format)) + " key-int-max=" + std::to_string(keyInterval(format.rate)) +
           " ! h265parse ! rtph265pay name=pay0 pt=96 config-interval=-1 aggregate-mode=zero-latency";
}

std::string codecPipeline(const PictureFormat& format, Codec codec) {
    switch (codec) {
    case Codec::h265:
        return h265Pipeline(format);
    case Codec::mjpeg:
        return "jpegenc name=encoder quality=80 ! rtpjpegpay name=pay0 pt=26";
    case Codec::h264:
        break;
    }
    return h264Pipeline(format);
}

// A stream that nobody takes has nowhere to go behind its payloader, and would end in an error that ends the other
// stream and everybody's connection with it. Before each payloader that is no error: what nobody takes is dropped.
std::string droppedWhileUnwatched(std::string pipeline) {
    static const std::string element = " ! errorignore ignore-notlinked=true ignore-error=false"
                                       " ignore-notnegotiated=false convert-to=ok";
    for (std::size_t payloader = pipeline.find(" ! rtp"); payloader != std::string::npos;
         payloader = pipeline.find(" ! rtp", payloader + element.size() + 1)) {
        pipeline.insert(payloader, element);
    }
    return pipeline;
}

// What a factory's media are made of; lives as long as the factory.
struct Recipe {
    PictureFormat format;
    MakePictures makePictures;
    std::optional<StreamSound> sound;
};

void startPictures(GstRTSPMedia* media, GstAppSrc* destination, const Recipe& recipe) {
    gst_app_src_set_caps(destination, recipe.format.caps().get());
    auto feeder = std::make_unique<Feeder>(destination, recipe.makePictures());
    g_object_set_data_full(G_OBJECT(media), feederKey, feeder.release(),
                           [](gpointer feeding) { std::default_delete<Feeder>()(static_cast<Feeder*>(feeding)); });
}

void startSound(GstRTSPMedia* media, GstAppSrc* destination, const StreamSound& sound) {
    gst_app_src_set_caps(destination, sound.format.caps().get());
    auto feeder = std::make_unique<SoundFeeder>(destination, sound.format, sound.make());
    g_object_set_data_full(G_OBJECT(media), soundFeederKey, feeder.release(), [](gpointer feeding) {
        std::default_delete<SoundFeeder>()(static_cast<SoundFeeder*>(feeding));
    });
}

// The feeders end with the media's pipeline, or with the media where that never came to play.
void onUnprepared(GstRTSPMedia* media, gpointer) {
    g_object_set_data(G_OBJECT(media), feederKey, nullptr);
    g_object_set_data(G_OBJECT(media), soundFeederKey, nullptr);
}

// RTCP reports are what puts pictures and sound together at the other end, as soon as they come. The five seconds
// between them that are usual are for groups of many.
void onPrepared(GstRTSPMedia* media, gpointer) {
    for (guint i = 0; i < gst_rtsp_media_n_streams(media); ++i) {
        const Object<GObject> session(gst_rtsp_stream_get_rtpsession(gst_rtsp_media_get_stream(media, i)));
        if (session) {
            g_object_set(session.get(), "rtcp-min-interval", reportInterval, nullptr);
        }
    }
}

void onMediaConfigure(GstRTSPMediaFactory*, GstRTSPMedia* media, gpointer data) {
    const auto* recipe = static_cast<const Recipe*>(data);
    const Object<GstElement> element(gst_rtsp_media_get_element(media));
    const Object<GstElement> picture(gst_bin_get_by_name(GST_BIN(element.get()), "picture"));
    startPictures(media, GST_APP_SRC(picture.get()), *recipe);
    if (recipe->sound) {
        const Object<GstElement> sound(gst_bin_get_by_name(GST_BIN(element.get()), "sound"));
        startSound(media, GST_APP_SRC(sound.get()), *recipe->sound);
    }
    g_signal_connect(media, "prepared", G_CALLBACK(onPrepared), nullptr);
    g_signal_connect(media, "unprepared", G_CALLBACK(onUnprepared), nullptr);
}

} // namespace

std::vector<NeededElement> elementsFor(Codec codec) {
    std::vector<NeededElement> elements{{"appsrc", "gstreamer1.0-plugins-base"},
                                        {"errorignore", "gstreamer1.0-plugins-bad"},
                                        {"rtpbin", "gstreamer1.0-plugins-good"},
                                        {"udpsink", "gstreamer1.0-plugins-good"}};
    switch (codec) {
    case Codec::h264:
        elements.push_back({"x264enc", "gstreamer1.0-plugins-ugly"});
        elements.push_back({"rtph264pay", "gstreamer1.0-plugins-good"});
        break;
    case Codec::h265:
        elements.push_back({"x265enc", "gstreamer1.0-plugins-bad"});
        elements.push_back({"h265parse", "gstreamer1.0-plugins-bad"});
        elements.push_back({"rtph265pay", "gstreamer1.0-plugins-good"});
        break;
    case Codec::mjpeg:
        elements.push_back({"jpegenc", "gstreamer1.0-plugins-good"});
        elements.push_back({"rtpjpegpay", "gstreamer1.0-plugins-good"});
        break;
    }
    return elements;
}

int bitRateFor(const PictureFormat& format) {
    constexpr double bitsAPixel = 0.12;
    constexpr int least = 400;
    const double pixels =
        1.0 * format.size.width * format.size.height * format.rate.numerator / format.rate.denominator;
    return std::max(least, static_cast<int>(std::lround(pixels * bitsAPixel / 1000)));
}

std::string encoderPipeline(const PictureFormat& format, Codec codec, std::optional<SoundCodec> sound) {
    return "( appsrc name=picture is-live=true format=time block=false max-buffers=1 max-bytes=0 max-time=0 "
           "leaky-type=downstream ! " +
           droppedWhileUnwatched(codecPipeline(format, codec) + " " + (sound ? soundPipeline(*sound) : "")) + " )";
}

Object<GstRTSPMediaFactory> makeStreamFactory(const PictureFormat& format, Codec codec, MakePictures makePictures,
                                              std::optional<StreamSound> sound) {
    Object<GstRTSPMediaFactory> factory(gst_rtsp_media_factory_new());
    gst_rtsp_media_factory_set_launch(
        factory.get(), encoderPipeline(format, codec, sound ? std::optional(sound->codec) : std::nullopt).c_str());
    gst_rtsp_media_factory_set_shared(factory.get(), TRUE);
    gst_rtsp_media_factory_set_protocols(
        factory.get(), static_cast<GstRTSPLowerTrans>(GST_RTSP_LOWER_TRANS_UDP | GST_RTSP_LOWER_TRANS_TCP));
    auto recipe = std::make_unique<Recipe>(Recipe{format, std::move(makePictures), std::move(sound)});
    g_signal_connect_data(
        factory.get(), "media-configure", G_CALLBACK(onMediaConfigure), recipe.release(),
        [](gpointer data, GClosure*) { std::default_delete<Recipe>()(static_cast<Recipe*>(data)); },
        static_cast<GConnectFlags>(0));
    return factory;
}

void requestKeyPicture(GstRTSPMedia* media) {
    const Object<GstElement> element(gst_rtsp_media_get_element(media));
    const Object<GstElement> encoder(gst_bin_get_by_name(GST_BIN(element.get()), "encoder"));
    const Object<GstPad> pad(encoder ? gst_element_get_static_pad(encoder.get(), "src") : nullptr);
    if (pad) {
        gst_pad_send_event(pad.get(), gst_video_event_new_upstream_force_key_unit(GST_CLOCK_TIME_NONE, TRUE, 0));
    }
}

} // namespace qivo
