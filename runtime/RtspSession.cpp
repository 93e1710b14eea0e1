#include "runtime/RtspSession.h"

#include "runtime/GstChain.h"
#include "runtime/Log.h"
#include "runtime/LogOnce.h"
#include "runtime/PictureConverter.h"
#include "runtime/SamplePicture.h"
#include "runtime/SoundCodec.h"

#include <gst/rtsp/gstrtspmessage.h>
#include <gst/rtsp/gstrtsptransport.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <initializer_list>
#include <utility>
#include <vector>

namespace qivo::runtime {
namespace {

/// Encoded pictures that may wait for the decoder after a hiccup; a source that is too much for it in the long run is
/// held to this and loses packets in the jitter buffer instead of falling behind.
constexpr GstClockTime kDecoderQueue = 200 * GST_MSECOND;
constexpr guint kDecoderQueueUnits = 64;
/// Up to this much of them the decoder waits for a caller who is about to take the pictures it has made.
constexpr GstClockTime kWaitsForCaller = 150 * GST_MSECOND;
/// Bytes that a source may send before a picture is complete, and before a unit of sound is.
constexpr std::size_t kLargestUnit = 32U << 20U;
constexpr std::size_t kLargestSoundUnit = 1U << 20U;
/// Requests from the first to the server's consent to send, redirections and logins included.
constexpr int kHandshakeRequests = 24;
/// Those of them that set the stream up: over UDP and TCP, each with and without a login.
constexpr int kHandshakeSetups = 4;
/// What is believed of a source about the time from one picture to the next, in seconds.
constexpr double kLongestInterval = 30.0;
/// How soon a gap is forgotten: with each picture this part of it. A hiccup of a fast source is over after a second.
constexpr std::int64_t kFading = 16;
/// How long a source has to be watched before it is known how long it takes, unless it says so.
constexpr std::chrono::milliseconds kPaceTime{1000};
/// Twice as many threads do not halve the time for one picture, but they wake up the other decoders' processors.
constexpr guint kConversionThreads = 2;

/// How a payload becomes pictures. The parser may be null.
struct Codec {
    const char* encoding;
    const char* depayloader;
    const char* parser;
    const char* parsed;
    const char* decoder;
};

constexpr std::array<Codec, 3> kCodecs{{
    {"H264", "rtph264depay", "h264parse", "video/x-h264", "avdec_h264"},
    {"H265", "rtph265depay", "h265parse", "video/x-h265", "avdec_h265"},
    {"JPEG", "rtpjpegdepay", nullptr, "image/jpeg", "jpegdec"},
}};

const Codec* codecFor(const std::string& encoding) {
    const auto* it =
        std::find_if(kCodecs.begin(), kCodecs.end(), [&](const Codec& c) { return encoding == c.encoding; });
    return it != kCodecs.end() ? it : nullptr;
}

std::string textField(const GstStructure* structure, const char* name) {
    const char* value = gst_structure_get_string(structure, name);
    return value != nullptr ? value : "";
}

bool isWanted(const GstStructure* rtp, Media media) {
    const std::string kind = textField(rtp, "media");
    if (media == Media::video) {
        const bool known = codecFor(encodingOf(rtp)) != nullptr;
        if (kind == "video" && !known) {
            logOnce("video in " + encodingOf(rtp) + " is not received, only H.264, H.265 and JPEG");
        }
        return kind == "video" && known;
    }
    if (kind != "audio") {
        return false;
    }
    const std::string problem = soundProblem(rtp);
    if (!problem.empty()) {
        logOnce(problem);
    }
    return problem.empty();
}

GstOwned<GstCaps> boundedCaps(const char* name) {
    return GstOwned<GstCaps>(gst_caps_new_simple(name, "width", GST_TYPE_INT_RANGE, 1, kLargestSide, "height",
                                                 GST_TYPE_INT_RANGE, 1, kLargestSide, nullptr));
}

void setIfPresent(GstElement* element, const char* property, const char* value) {
    if (g_object_class_find_property(G_OBJECT_GET_CLASS(element), property) != nullptr) {
        gst_util_set_object_arg(G_OBJECT(element), property, value);
    }
}

/// Slices decode in parallel without delay; frame threads would hold back a picture each. Pictures that lack their
/// references after a start in mid-stream are not shown.
GstElement* makeDecoder(const char* factory) {
    GstElement* decoder = makeElement(factory);
    if (decoder != nullptr) {
        setIfPresent(decoder, "thread-type", "slice");
        setIfPresent(decoder, "output-corrupt", "false");
        setIfPresent(decoder, "std-compliance", "normal");
        setIfPresent(decoder, "max-errors", "-1");
        setIfPresent(decoder, "qos", "false");
    }
    return decoder;
}

GstElement* makeQueue() {
    GstElement* queue = makeElement("queue");
    if (queue != nullptr) {
        g_object_set(queue, "max-size-time", kDecoderQueue, "max-size-buffers", kDecoderQueueUnits, "max-size-bytes",
                     static_cast<guint>(kLargestUnit), nullptr);
    }
    return queue;
}

GstElement* makeConverter() {
    GstElement* converter = makePictureConverter();
    if (converter != nullptr) {
        g_object_set(converter, "n-threads", kConversionThreads, "qos", FALSE, nullptr);
        gst_util_set_object_arg(G_OBJECT(converter), "dither", "none");
    }
    return converter;
}

/// The buffer with what the pad knows about it.
GstOwned<GstSample> sampleOf(GstPad* pad, GstBuffer* buffer) {
    const GstOwned<GstCaps> caps(gst_pad_get_current_caps(pad));
    const GstOwned<GstEvent> event(gst_pad_get_sticky_event(pad, GST_EVENT_SEGMENT, 0));
    const GstSegment* segment = nullptr;
    if (event) {
        gst_event_parse_segment(event.get(), &segment);
    }
    return GstOwned<GstSample>(gst_sample_new(buffer, caps.get(), segment, nullptr));
}

std::int64_t nowTicks() {
    return RtspSession::Clock::now().time_since_epoch().count();
}

std::int64_t ticksOf(double seconds) {
    return std::chrono::duration_cast<RtspSession::Clock::duration>(std::chrono::duration<double>(seconds)).count();
}

std::optional<RtspSession::Clock::time_point> timeOf(std::int64_t ticks) {
    return ticks == 0 ? std::nullopt
                      : std::optional(RtspSession::Clock::time_point(RtspSession::Clock::duration(ticks)));
}

std::size_t bytesOf(GstPadProbeInfo* info) {
    if ((info->type & GST_PAD_PROBE_TYPE_BUFFER_LIST) != 0) {
        return gst_buffer_list_calculate_size(GST_PAD_PROBE_INFO_BUFFER_LIST(info));
    }
    return gst_buffer_get_size(GST_PAD_PROBE_INFO_BUFFER(info));
}

/// Null for an empty list.
GstBuffer* firstOf(GstPadProbeInfo* info) {
    if ((info->type & GST_PAD_PROBE_TYPE_BUFFER_LIST) == 0) {
        return GST_PAD_PROBE_INFO_BUFFER(info);
    }
    GstBufferList* list = GST_PAD_PROBE_INFO_BUFFER_LIST(info);
    return gst_buffer_list_length(list) > 0 ? gst_buffer_list_get(list, 0) : nullptr;
}

} // namespace

/// What GStreamer calls, on threads of its own; none of them runs once the pipeline is in its null state.
struct RtspSession::Callbacks {
    static RtspSession& self(gpointer data) { return *static_cast<RtspSession*>(data); }

    static gboolean selectStream(GstElement*, guint, GstCaps* caps, gpointer data) {
        RtspSession& session = self(data);
        session.m_described = true;
        const GstStructure* rtp = gst_caps_get_structure(caps, 0);
        if (session.m_selected || !isWanted(rtp, session.m_settings.media)) {
            return FALSE;
        }
        session.m_selected = true;
        session.readRate(rtp);
        return TRUE;
    }

    /// An answer that it cannot read makes the source ask again without end, and open sockets each time.
    static gboolean beforeSend(GstElement* source, GstRTSPMessage* message, gpointer data) {
        RtspSession& session = self(data);
        if (session.m_requests == 0) {
            // The connection stands: from here on it is the server that takes its time.
            const guint64 limit = std::chrono::microseconds(session.m_settings.stepLimit).count();
            g_object_set(source, "tcp-timeout", limit, nullptr);
        }
        if (session.playingSince() || message->type != GST_RTSP_MESSAGE_REQUEST) {
            return TRUE;
        }
        if (message->type_data.request.method == GST_RTSP_SETUP && ++session.m_setups > kHandshakeSetups) {
            session.fail(Failure::Kind::noTransport, "the server offers no transport that makes sense");
        }
        if (++session.m_requests > kHandshakeRequests) {
            session.fail(Failure::Kind::broken, "the server's answers lead nowhere");
        }
        if (session.m_setups > kHandshakeSetups || session.m_requests > kHandshakeRequests) {
            // Until somebody comes to take the session apart the source would go on asking.
            session.m_ending.wait(false);
        }
        return TRUE;
    }

    static void padAdded(GstElement*, GstPad* pad, gpointer data) { self(data).addBranch(pad); }

    static GstPadProbeReturn packet(GstPad*, GstPadProbeInfo* info, gpointer data) {
        RtspSession& session = self(data);
        session.packetArrived();
        session.m_clock.look(firstOf(info));
        session.m_unitBytes += bytesOf(info);
        if (session.m_unitBytes > (session.m_settings.media == Media::video ? kLargestUnit : kLargestSoundUnit)) {
            session.fail(Failure::Kind::broken,
                         session.m_settings.media == Media::video ? "a picture has no end" : "the sound has no end");
            return GST_PAD_PROBE_DROP;
        }
        return GST_PAD_PROBE_OK;
    }

    static GstPadProbeReturn unitComplete(GstPad*, GstPadProbeInfo*, gpointer data) {
        self(data).unitComplete();
        return GST_PAD_PROBE_OK;
    }

    /// The decoder tells what its pictures are like.
    static GstPadProbeReturn decoded(GstPad* pad, GstPadProbeInfo* info, gpointer data) {
        GstEvent* event = GST_PAD_PROBE_INFO_EVENT(info);
        GstCaps* caps = nullptr;
        if (GST_EVENT_TYPE(event) == GST_EVENT_CAPS) {
            gst_event_parse_caps(event, &caps);
            const std::string mode = textField(gst_caps_get_structure(caps, 0), "interlace-mode");
            if (!mode.empty() && mode != "progressive" && !self(data).m_deinterlacing) {
                self(data).deinterlace(pad, caps);
            }
        }
        return GST_PAD_PROBE_OK;
    }

    /// A picture is about to be converted.
    static GstPadProbeReturn makeRoom(GstPad*, GstPadProbeInfo*, gpointer data) {
        RtspSession& session = self(data);
        session.m_arrived = wallClock();
        if (!session.m_muted && !session.m_making.exchange(true)) {
            session.m_mailbox->makeRoom(session.decoderPatience());
        }
        return session.m_muted ? GST_PAD_PROBE_DROP : GST_PAD_PROBE_OK;
    }

    /// A picture has been converted.
    static GstPadProbeReturn handOn(GstPad* pad, GstPadProbeInfo* info, gpointer data) {
        RtspSession& session = self(data);
        GstBuffer* buffer = GST_PAD_PROBE_INFO_BUFFER(info);
        auto picture =
            SamplePicture::map(sampleOf(pad, buffer), session.m_clock.at(GST_BUFFER_PTS(buffer)), session.m_arrived);
        if (picture && !session.m_muted && session.m_making.exchange(false)) {
            session.m_mailbox->offer(std::move(picture));
        }
        return GST_PAD_PROBE_OK;
    }

    static GstBusSyncReply message(GstBus*, GstMessage* message, gpointer data) {
        RtspSession& session = self(data);
        switch (GST_MESSAGE_TYPE(message)) {
        case GST_MESSAGE_ERROR:
            session.fail(session.m_selected ? Failure::Kind::broken : session.unselectedKind(), errorText(message));
            break;
        case GST_MESSAGE_EOS:
            session.fail(Failure::Kind::broken, "the source has ended the stream");
            break;
        case GST_MESSAGE_PROGRESS:
            session.progress(message);
            break;
        default:
            break;
        }
        gst_message_unref(message);
        return GST_BUS_DROP;
    }

    static std::string errorText(GstMessage* message) {
        GError* error = nullptr;
        gst_message_parse_error(message, &error, nullptr);
        const GstOwned<GError> owned(error);
        return error != nullptr && error->message != nullptr ? error->message : "unknown error";
    }
};

RtspSession::RtspSession(Settings settings, std::shared_ptr<Mailbox> mailbox, std::shared_ptr<Wakeup> wakeup)
    : m_settings(std::move(settings)), m_mailbox(std::move(mailbox)), m_wakeup(std::move(wakeup)) {
    if (!build()) {
        fail(Failure::Kind::noStream, "the GStreamer elements for RTSP are missing");
        return;
    }
    if (gst_element_set_state(m_pipeline.get(), GST_STATE_PLAYING) == GST_STATE_CHANGE_FAILURE) {
        fail(Failure::Kind::broken, "the address cannot be used");
    }
}

RtspSession::~RtspSession() {
    m_ending = true;
    m_ending.notify_all();
    if (m_pipeline) {
        gst_element_set_state(m_pipeline.get(), GST_STATE_NULL);
        const GstOwned<GstBus> bus(gst_element_get_bus(m_pipeline.get()));
        gst_bus_set_sync_handler(bus.get(), nullptr, nullptr, nullptr);
    }
    if (m_making) {
        m_mailbox->abandon();
    }
}

bool RtspSession::build() {
    m_pipeline.reset(GST_ELEMENT(gst_object_ref_sink(gst_pipeline_new(nullptr))));
    m_source = makeElement("rtspsrc");
    if (m_source == nullptr) {
        return false;
    }
    gst_bin_add(GST_BIN(m_pipeline.get()), m_source);
    const guint protocols =
        m_settings.tcpOnly ? GST_RTSP_LOWER_TRANS_TCP : GST_RTSP_LOWER_TRANS_UDP | GST_RTSP_LOWER_TRANS_TCP;
    const guint64 stepLimit = std::chrono::microseconds(kStepLimit).count();
    // Pictures that wait too long are old news; sound that comes in a burst is not lost before its own bound.
    const gboolean dropping = m_settings.media == Media::video ? TRUE : FALSE;
    // The source's own ways to heal (another transport, another connection) are off: they would run beside ours.
    g_object_set(m_source, "location", m_settings.url.c_str(), "protocols", protocols, "latency", kJitterBufferMs,
                 "drop-on-latency", dropping, "tcp-timeout", stepLimit, "timeout", guint64{0}, "udp-reconnect", FALSE,
                 "user-agent", "libqivo", nullptr);
    // With the sender's clock followed by a slope rather than an offset, drift cannot add up.
    gst_util_set_object_arg(G_OBJECT(m_source), "buffer-mode", "slave");
    setIfPresent(m_source, "add-reference-timestamp-meta", "true");
    g_signal_connect(m_source, "select-stream", G_CALLBACK(Callbacks::selectStream), this);
    g_signal_connect(m_source, "before-send", G_CALLBACK(Callbacks::beforeSend), this);
    g_signal_connect(m_source, "pad-added", G_CALLBACK(Callbacks::padAdded), this);
    const GstOwned<GstBus> bus(gst_element_get_bus(m_pipeline.get()));
    gst_bus_set_sync_handler(bus.get(), Callbacks::message, this, nullptr);
    return true;
}

void RtspSession::fail(Failure::Kind kind, std::string reason) {
    {
        const std::lock_guard guard(m_mutex);
        if (m_failure) {
            return;
        }
        m_failure = Failure{kind, std::move(reason)};
    }
    m_wakeup->notify();
}

RtspSession::Failure::Kind RtspSession::unselectedKind() const {
    return m_described ? Failure::Kind::noStream : Failure::Kind::broken;
}

void RtspSession::progress(GstMessage* message) {
    GstProgressType type = GST_PROGRESS_TYPE_ERROR;
    gchar* code = nullptr;
    gst_message_parse_progress(message, &type, &code, nullptr);
    const GstOwned<gchar> owned(code);
    if (type == GST_PROGRESS_TYPE_COMPLETE && g_strcmp0(code, "request") == 0) {
        m_playingSince = nowTicks();
        m_wakeup->notify();
    }
}

/// The first tells the caller that the source is connected: here and not by whoever watches the session, for whom its
/// first picture may be faster.
void RtspSession::packetArrived() {
    if (m_lastPacket.exchange(nowTicks()) == 0) {
        if (!m_muted) {
            m_mailbox->raiseStatus();
        }
        m_wakeup->notify();
    }
}

void RtspSession::readRate(const GstStructure* rtp) {
    const double rate = g_ascii_strtod(textField(rtp, "a-framerate").c_str(), nullptr);
    if (rate > 0.0) {
        m_saidInterval = ticksOf(std::min(1.0 / rate, kLongestInterval));
    }
}

void RtspSession::unitComplete() {
    m_unitBytes = 0;
    const std::int64_t now = nowTicks();
    if (m_firstUnit == 0) {
        m_firstUnit = now;
    }
    const std::int64_t last = m_lastUnit.exchange(now);
    const std::int64_t gap = last == 0 ? 0 : std::min(now - last, ticksOf(kLongestInterval));
    m_longestGap = std::max(gap, m_longestGap - m_longestGap / kFading);
}

void RtspSession::addBranch(GstPad* pad) {
    const GstOwned<GstCaps> caps(gst_pad_get_current_caps(pad));
    const GstStructure* rtp = caps && !gst_caps_is_empty(caps.get()) ? gst_caps_get_structure(caps.get(), 0) : nullptr;
    if (m_linked || rtp == nullptr || !isWanted(rtp, m_settings.media)) {
        addSink(pad);
        return;
    }
    m_linked = true;
    gst_pad_add_probe(pad, kDataProbe, Callbacks::packet, this, nullptr);
    const std::string encoding = encodingOf(rtp);
    if (m_settings.media == Media::video ? !addVideo(pad, encoding) : !addAudio(pad, encoding)) {
        fail(Failure::Kind::noStream, "the GStreamer elements for " + encoding + " are missing");
    }
}

void RtspSession::addSink(GstPad* pad) {
    appendChain(GST_BIN(m_pipeline.get()), pad, {makeSink()});
}

bool RtspSession::addAudio(GstPad* pad, const std::string& encoding) {
    SoundBranch::Calls calls;
    calls.emit = [this](std::unique_ptr<Sound> sound) {
        if (!m_muted) {
            m_mailbox->offer(std::move(sound));
        }
    };
    calls.unitComplete = [this] { unitComplete(); };
    calls.refused = [this](std::string problem) { fail(Failure::Kind::noStream, std::move(problem)); };
    m_sound = std::make_unique<SoundBranch>(std::move(calls), m_clock);
    return m_sound->build(GST_BIN(m_pipeline.get()), pad, encoding);
}

bool RtspSession::addVideo(GstPad* pad, const std::string& encoding) {
    const Codec& codec = *codecFor(encoding);
    const GstOwned<GstCaps> parsed = boundedCaps(codec.parsed);
    const GstOwned<GstCaps> decoded = boundedCaps("video/x-raw");
    const GstOwned<GstCaps> rgba(gst_caps_new_simple("video/x-raw", "format", G_TYPE_STRING, "RGBA", nullptr));
    // In the order of the data; pictures are bounded before anything of their size is allocated.
    std::vector<GstElement*> chain{makeElement(codec.depayloader)};
    if (codec.parser != nullptr) {
        chain.push_back(makeElement(codec.parser));
        chain.push_back(makeFilter(parsed.get()));
    }
    GstElement* queue = m_decoderQueue = makeQueue();
    GstElement* bounded = makeFilter(decoded.get());
    GstElement* converter = makeConverter();
    GstElement* sink = makeSink();
    chain.insert(chain.end(), {queue, makeDecoder(codec.decoder), bounded, converter, makeFilter(rgba.get()), sink});
    if (queue != nullptr && bounded != nullptr && converter != nullptr && sink != nullptr) {
        const GstOwned<GstPad> pictures(gst_element_get_static_pad(bounded, "src"));
        gst_pad_add_probe(pictures.get(), GST_PAD_PROBE_TYPE_EVENT_DOWNSTREAM, Callbacks::decoded, this, nullptr);
        watchInput(queue, kDataProbe, Callbacks::unitComplete, this);
        watchInput(converter, kDataProbe, Callbacks::makeRoom, this);
        watchInput(sink, GST_PAD_PROBE_TYPE_BUFFER, Callbacks::handOn, this);
    }
    return appendChain(GST_BIN(m_pipeline.get()), pad, chain);
}

/// How long the decoder may wait without packets being lost before it, as long as they come no faster than usual.
std::chrono::nanoseconds RtspSession::decoderPatience() const {
    guint64 waiting = 0;
    g_object_get(m_decoderQueue, "current-level-time", &waiting, nullptr);
    return std::chrono::nanoseconds(kWaitsForCaller - std::min<guint64>(waiting, kWaitsForCaller));
}

/// Makes one whole picture of each pair of fields, without waiting for later ones. Progressive streams, which most are,
/// never meet the element; where they follow on interlaced pictures they pass it untouched.
void RtspSession::deinterlace(GstPad* decoded, GstCaps* caps) {
    m_deinterlacing = true;
    GstElement* element = makeElement("deinterlace");
    if (element == nullptr) {
        return;
    }
    gst_util_set_object_arg(G_OBJECT(element), "method", "vfir");
    gst_util_set_object_arg(G_OBJECT(element), "fields", "top");
    gst_bin_add(GST_BIN(m_pipeline.get()), element);
    const GstOwned<GstPad> in(gst_element_get_static_pad(element, "sink"));
    const GstOwned<GstPad> out(gst_element_get_static_pad(element, "src"));
    if (gst_pad_query_accept_caps(in.get(), caps) == FALSE) {
        logOnce("interlaced pictures of this kind are shown as they are");
        gst_bin_remove(GST_BIN(m_pipeline.get()), element);
        return;
    }
    const GstOwned<GstPad> next(gst_pad_get_peer(decoded));
    gst_pad_unlink(decoded, next.get());
    gst_pad_link(decoded, in.get());
    gst_pad_link(out.get(), next.get());
    gst_element_sync_state_with_parent(element);
}

std::optional<RtspSession::Failure> RtspSession::failure() const {
    const std::lock_guard guard(m_mutex);
    return m_failure;
}

std::optional<RtspSession::Clock::time_point> RtspSession::playingSince() const {
    return timeOf(m_playingSince);
}

std::optional<RtspSession::Clock::time_point> RtspSession::lastPacket() const {
    return timeOf(m_lastPacket);
}

RtspSession::Clock::duration RtspSession::unitInterval() const {
    return Clock::duration(std::max<std::int64_t>(m_saidInterval, m_longestGap));
}

bool RtspSession::paceKnown() const {
    const Clock::duration watched(m_lastUnit - m_firstUnit);
    return watched >= (m_saidInterval > 0 ? Clock::duration(1) : kPaceTime);
}

} // namespace qivo::runtime
