#include "tools/record/PictureEncoder.h"

#include <algorithm>
#include <utility>

namespace qivo::record {
namespace {

std::vector<std::uint8_t> bytesOf(GstBuffer* buffer) {
    std::vector<std::uint8_t> bytes(gst_buffer_get_size(buffer));
    gst_buffer_extract(buffer, 0, bytes.data(), bytes.size());
    return bytes;
}

} // namespace

struct PictureEncoder::Callbacks {
    static GstFlowReturn newSample(GstAppSink* sink, gpointer data) {
        const Media<GstSample> sample(gst_app_sink_pull_sample(sink));
        if (sample) {
            static_cast<PictureEncoder*>(data)->handOn(sample.get());
        }
        return GST_FLOW_OK;
    }
};

std::unique_ptr<PictureEncoder> PictureEncoder::create(const PictureShape& shape, const EncoderCandidate& encoder,
                                                       Calls calls, std::string& problem) {
    std::unique_ptr<PictureEncoder> created(new PictureEncoder(shape, std::move(calls)));
    if (!created->start(encoder)) {
        problem = "the encoder " + encoder.element + " cannot be started";
        return nullptr;
    }
    return created;
}

PictureEncoder::PictureEncoder(const PictureShape& shape, Calls calls)
    : m_shape(shape), m_calls(std::move(calls)), m_fitter(shape) {}

PictureEncoder::~PictureEncoder() {
    if (m_pipeline) {
        gst_element_set_state(m_pipeline.get(), GST_STATE_NULL);
    }
}

bool PictureEncoder::start(const EncoderCandidate& encoder) {
    m_element = encoder.element;
    GError* error = nullptr;
    m_pipeline.reset(gst_parse_launch(encoderPipeline(encoder).c_str(), &error));
    const Media<GError> owned(error);
    if (!m_pipeline || owned || !m_fitter.ready()) {
        return false;
    }
    m_in.reset(gst_bin_get_by_name(GST_BIN(m_pipeline.get()), "in"));
    m_out.reset(gst_bin_get_by_name(GST_BIN(m_pipeline.get()), "out"));
    const Media<GstCaps> caps(gst_video_info_to_caps(&m_fitter.format()));
    gst_app_src_set_caps(GST_APP_SRC(m_in.get()), caps.get());
    GstAppSinkCallbacks callbacks{};
    callbacks.new_sample = Callbacks::newSample;
    gst_app_sink_set_callbacks(GST_APP_SINK(m_out.get()), &callbacks, this, nullptr);
    m_running = gst_element_set_state(m_pipeline.get(), GST_STATE_PLAYING) != GST_STATE_CHANGE_FAILURE;
    return m_running;
}

PictureEncoder::Taken PictureEncoder::encode(const QIVOlib_video_frame_v2_t& frame, Nanoseconds time) {
    if (!PictureFitter::isReadable(frame)) {
        return Taken::unreadable;
    }
    Media<GstBuffer> picture = m_running ? m_fitter.fit(frame) : nullptr;
    if (!picture) {
        return Taken::behind;
    }
    GST_BUFFER_PTS(picture.get()) = static_cast<GstClockTime>(time.count());
    if (gst_app_src_push_buffer(GST_APP_SRC(m_in.get()), picture.release()) != GST_FLOW_OK) {
        return Taken::behind;
    }
    ++m_taken;
    return Taken::yes;
}

std::uint64_t PictureEncoder::finish(Nanoseconds limit) {
    if (!m_running) {
        return 0;
    }
    m_running = false;
    gst_app_src_end_of_stream(GST_APP_SRC(m_in.get()));
    const Media<GstBus> bus(gst_element_get_bus(m_pipeline.get()));
    const bool failed = !problem().empty();
    const Media<GstMessage> ended(
        gst_bus_timed_pop_filtered(bus.get(), failed ? 0 : static_cast<GstClockTime>(limit.count()),
                                   static_cast<GstMessageType>(GST_MESSAGE_EOS | GST_MESSAGE_ERROR)));
    if (ended && GST_MESSAGE_TYPE(ended.get()) == GST_MESSAGE_ERROR) {
        noteFailure(ended.get());
    }
    const std::lock_guard guard(m_handing);
    m_ended = true;
    return m_taken - std::min(m_taken, m_handedOn);
}

void PictureEncoder::noteFailure(GstMessage* message) const {
    const std::lock_guard guard(m_mutex);
    if (m_problem.empty()) {
        m_problem = "the encoder " + m_element + " has failed: " + errorText(message);
    }
}

std::string PictureEncoder::problem() const {
    const Media<GstBus> bus(gst_element_get_bus(m_pipeline.get()));
    const Media<GstMessage> message(gst_bus_pop_filtered(bus.get(), GST_MESSAGE_ERROR));
    if (message) {
        noteFailure(message.get());
    }
    const std::lock_guard guard(m_mutex);
    return m_problem;
}

void PictureEncoder::handOnFormat(GstSample* sample) {
    const GstStructure* structure = gst_caps_get_structure(gst_sample_get_caps(sample), 0);
    const GValue* setup = gst_structure_get_value(structure, "codec_data");
    GstBuffer* buffer = setup != nullptr ? gst_value_get_buffer(setup) : nullptr;
    if (buffer == nullptr) {
        return;
    }
    m_formatKnown = true;
    m_calls.format({m_shape.width, m_shape.height, m_shape.pixelAspectN, m_shape.pixelAspectD, bytesOf(buffer)});
}

void PictureEncoder::handOn(GstSample* sample) {
    const std::lock_guard guard(m_handing);
    if (m_ended) {
        return;
    }
    if (!m_formatKnown) {
        handOnFormat(sample);
    }
    GstBuffer* buffer = gst_sample_get_buffer(sample);
    // Encoders may count from another beginning; the segment knows.
    const GstClockTime time =
        gst_segment_to_running_time(gst_sample_get_segment(sample), GST_FORMAT_TIME, GST_BUFFER_PTS(buffer));
    if (m_formatKnown && GST_CLOCK_TIME_IS_VALID(time)) {
        m_calls.picture({bytesOf(buffer), Nanoseconds(static_cast<std::int64_t>(time)),
                         !GST_BUFFER_FLAG_IS_SET(buffer, GST_BUFFER_FLAG_DELTA_UNIT)});
        ++m_handedOn;
    }
}

} // namespace qivo::record
