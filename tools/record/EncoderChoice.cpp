#include "tools/record/EncoderChoice.h"

#include "tools/record/Handles.h"
#include "tools/record/PictureFitter.h"

#include <gst/app/app.h>

namespace qivo::record {
namespace {

constexpr int trialPictures = 3;
constexpr GstClockTime trialStep = 20 * GST_MSECOND;
constexpr double manyPixels = 1280.0 * 720 * 30; ///< a second
constexpr unsigned fewProcessors = 4;

/// x264's presets by how much there is to do and who does it: the slower ones save space, but a picture that comes
/// while the encoder is behind is lost.
std::string x264Preset(const PictureShape& shape, unsigned processors) {
    const double pixels = static_cast<double>(shape.width) * shape.height * shape.rateN / shape.rateD;
    const double share = pixels / manyPixels / (processors > fewProcessors ? 2 : 1);
    return share > 1 ? "ultrafast" : "superfast";
}

std::string x264Properties(const PictureShape& shape, unsigned processors) {
    // Constant quality. No picture waits for later ones, so that what has been received is soon on the disk: slices are
    // encoded beside each other, since whole pictures beside each other would hold some back.
    return "speed-preset=" + x264Preset(shape, processors) +
           " pass=qual quantizer=21 bitrate=80000 bframes=0 rc-lookahead=0 sync-lookahead=0 mb-tree=false "
           "key-int-max=60 qos=false sliced-threads=true threads=" +
           std::to_string(processors > 2 ? 3 : 2);
}

bool isInstalled(const std::string& element) {
    return Media<GstElementFactory>(gst_element_factory_find(element.c_str())) != nullptr;
}

void pushTrial(GstElement* pipeline, const PictureShape& shape) {
    const Media<GstElement> in(gst_bin_get_by_name(GST_BIN(pipeline), "in"));
    PictureFitter fitter(shape);
    const Media<GstCaps> caps(gst_video_info_to_caps(&fitter.format()));
    gst_app_src_set_caps(GST_APP_SRC(in.get()), caps.get());
    for (int i = 0; i < trialPictures; ++i) {
        GstBuffer* picture = gst_buffer_new_allocate(nullptr, GST_VIDEO_INFO_SIZE(&fitter.format()), nullptr);
        gst_buffer_memset(picture, 0, 0x80, GST_VIDEO_INFO_SIZE(&fitter.format()));
        GST_BUFFER_PTS(picture) = static_cast<GstClockTime>(i) * GST_SECOND / 30;
        gst_app_src_push_buffer(GST_APP_SRC(in.get()), picture);
    }
    gst_app_src_end_of_stream(GST_APP_SRC(in.get()));
}

/// Why the pipeline has failed; empty if it has not.
std::string failureOf(GstElement* pipeline) {
    const Media<GstBus> bus(gst_element_get_bus(pipeline));
    const Media<GstMessage> message(gst_bus_pop_filtered(bus.get(), GST_MESSAGE_ERROR));
    return message ? errorText(message.get()) : "";
}

/// Why it does not encode a few pictures; empty if it does.
std::string trial(const EncoderCandidate& candidate, const PictureShape& shape,
                  std::chrono::steady_clock::time_point limit, const std::atomic<bool>& stopped) {
    GError* error = nullptr;
    const Media<GstElement> pipeline(gst_parse_launch(encoderPipeline(candidate).c_str(), &error));
    const Media<GError> owned(error);
    if (!pipeline || owned) {
        return owned ? owned->message : "cannot be made";
    }
    gst_element_set_state(pipeline.get(), GST_STATE_PLAYING);
    pushTrial(pipeline.get(), shape);
    const Media<GstElement> out(gst_bin_get_by_name(GST_BIN(pipeline.get()), "out"));
    int pictures = 0;
    std::string failure;
    while (pictures < trialPictures && failure.empty()) {
        if (const Media<GstSample> sample{gst_app_sink_try_pull_sample(GST_APP_SINK(out.get()), trialStep)}) {
            ++pictures;
            continue;
        }
        failure = failureOf(pipeline.get());
        if (failure.empty() && gst_app_sink_is_eos(GST_APP_SINK(out.get()))) {
            failure = "swallows pictures";
        } else if (failure.empty() && (stopped || std::chrono::steady_clock::now() >= limit)) {
            failure = "takes too long";
        }
    }
    gst_element_set_state(pipeline.get(), GST_STATE_NULL);
    return failure;
}

} // namespace

std::vector<EncoderCandidate> encoderCandidates(const PictureShape& shape, unsigned processors) {
    return {
        {"vah264enc", "rate-control=cqp qpi=21 qpp=23 b-frames=0 key-int-max=60", true},
        {"vah264lpenc", "rate-control=cqp qpi=21 qpp=23 b-frames=0 key-int-max=60", true},
        {"nvh264enc", "rc-mode=constqp qp-const-i=21 qp-const-p=23 bframes=0 gop-size=60 zerolatency=true", true},
        {"qsvh264enc", "rate-control=cqp qp-i=21 qp-p=23 b-frames=0 gop-size=60", true},
        {"vaapih264enc", "rate-control=cqp init-qp=22 max-bframes=0 keyframe-period=60", true},
        {"v4l2h264enc", "", true},
        {"x264enc", x264Properties(shape, processors), false},
        {"openh264enc", "rate-control=quality bitrate=20000000 gop-size=60 complexity=low", false},
    };
}

std::string encoderPipeline(const EncoderCandidate& encoder) {
    return "appsrc name=in is-live=false format=time max-bytes=0 ! videoconvert qos=false ! " + encoder.element + " " +
           encoder.properties +
           " ! h264parse ! video/x-h264,stream-format=avc,alignment=au ! appsink name=out sync=false";
}

EncoderChoice chooseEncoder(const std::vector<EncoderCandidate>& candidates, const PictureShape& shape,
                            const std::atomic<bool>& stopped) {
    const auto limit = std::chrono::steady_clock::now() + trialLimit;
    EncoderChoice choice;
    for (const EncoderCandidate& candidate : candidates) {
        if (!isInstalled(candidate.element)) {
            continue;
        }
        const bool late = candidate.hardware && (stopped || std::chrono::steady_clock::now() >= limit);
        const std::string failure = late                 ? "takes too long"
                                    : candidate.hardware ? trial(candidate, shape, limit, stopped)
                                                         : "";
        if (failure.empty()) {
            choice.encoder = candidate;
            return choice;
        }
        choice.passedOver += (choice.passedOver.empty() ? "" : ", ") + candidate.element + " (" + failure + ")";
    }
    return choice;
}

} // namespace qivo::record
