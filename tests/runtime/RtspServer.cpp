#include "tests/runtime/RtspServer.h"

#include <chrono>
#include <future>
#include <memory>
#include <stdexcept>
#include <utility>

namespace qivo::test {

/// What the server calls, on its own thread.
struct RtspServer::Callbacks {
    static State& state(gpointer data) { return **static_cast<std::shared_ptr<State>*>(data); }

    /// Calls back with the state for as long as `instance` lives.
    static void connect(gpointer instance, const char* signal, GCallback callback, std::shared_ptr<State> state) {
        auto kept = std::make_unique<std::shared_ptr<State>>(std::move(state));
        g_signal_connect_data(
            instance, signal, callback, kept.release(),
            [](gpointer data, GClosure*) {
                std::default_delete<std::shared_ptr<State>>()(static_cast<std::shared_ptr<State>*>(data));
            },
            GConnectFlags());
    }

    static void connected(GstRTSPServer*, GstRTSPClient* client, gpointer data) {
        const auto& kept = *static_cast<std::shared_ptr<State>*>(data);
        ++kept->connections;
        connect(client, "setup-request", G_CALLBACK(setUp), kept);
        connect(client, "new-session", G_CALLBACK(newSession), kept);
    }

    static void newSession(GstRTSPClient*, GstRTSPSession* session, gpointer data) {
        gst_rtsp_session_set_timeout(session, static_cast<guint>(state(data).sessionTimeout.count()));
    }

    static void setUp(GstRTSPClient*, GstRTSPContext* context, gpointer data) {
        ++state(data).setups;
        gchar* transport = nullptr;
        gst_rtsp_message_get_header(context->request, GST_RTSP_HDR_TRANSPORT, &transport, 0);
        if (transport != nullptr && std::string(transport).find("TCP") != std::string::npos) {
            ++state(data).tcpSetups;
        }
    }

    static void configure(GstRTSPMediaFactory*, GstRTSPMedia* media, gpointer data) {
        const auto& kept = *static_cast<std::shared_ptr<State>*>(data);
        GstElement* element = gst_rtsp_media_get_element(media);
        for (int i = 0; GstElement* payloader = payloaderOf(element, i); ++i) {
            GstPad* pad = gst_element_get_static_pad(payloader, "src");
            gst_pad_add_probe(pad,
                              static_cast<GstPadProbeType>(GST_PAD_PROBE_TYPE_BUFFER | GST_PAD_PROBE_TYPE_BUFFER_LIST),
                              send, new Way{kept}, // NOLINT
                              [](gpointer way) { std::default_delete<Way>()(static_cast<Way*>(way)); });
            gst_object_unref(pad);
            gst_object_unref(payloader);
        }
        connect(media, "prepared", G_CALLBACK(prepared), kept);
        keep(*kept, element);
    }

    /// Takes the reference, in the place of the one to the pipeline before.
    static void keep(State& state, GstElement* pipeline, bool ends = false) {
        {
            const std::lock_guard guard(state.mutex);
            if (!state.ended) {
                std::swap(state.pipeline, pipeline);
            }
            state.ended = state.ended || ends;
        }
        if (pipeline != nullptr) {
            gst_object_unref(pipeline);
        }
    }

    static void prepared(GstRTSPMedia* media, gpointer data) {
        const guint64 interval = std::chrono::nanoseconds(state(data).reports).count();
        for (guint i = 0; interval > 0 && i < gst_rtsp_media_n_streams(media); ++i) {
            GObject* session = gst_rtsp_stream_get_rtpsession(gst_rtsp_media_get_stream(media, i));
            g_object_set(session, "rtcp-min-interval", interval, nullptr);
            g_object_unref(session);
        }
    }

    static GstElement* payloaderOf(GstElement* bin, int number) {
        return gst_bin_get_by_name(GST_BIN(bin), ("pay" + std::to_string(number)).c_str());
    }

    /// Where packets go, or do not.
    struct Way {
        std::shared_ptr<State> state;
        unsigned count = 0;
    };

    static GstPadProbeReturn send(GstPad*, GstPadProbeInfo*, gpointer data) {
        auto& way = *static_cast<Way*>(data);
        const unsigned lossy = way.state->lossy;
        const bool lost = lossy > 0 && ++way.count % lossy == 0;
        return way.state->silent || lost ? GST_PAD_PROBE_DROP : GST_PAD_PROBE_OK;
    }

    static GstRTSPFilterResult removeClient(GstRTSPServer*, GstRTSPClient*, gpointer) { return GST_RTSP_FILTER_REMOVE; }
};

RtspServer::RtspServer(Options options)
    : m_options(std::move(options)),
      m_state(std::shared_ptr<State>(new State{m_options.sessionTimeout, m_options.reports})) {
    gst_init(nullptr, nullptr);
    m_context = g_main_context_new();
    m_loop = g_main_loop_new(m_context, FALSE);
    m_server = gst_rtsp_server_new();
    gst_rtsp_server_set_address(m_server, m_options.address.c_str());
    gst_rtsp_server_set_service(m_server, std::to_string(m_options.port).c_str());
    if (!m_options.user.empty()) {
        GstRTSPAuth* auth = gst_rtsp_auth_new();
        GstRTSPToken* token =
            gst_rtsp_token_new(GST_RTSP_TOKEN_MEDIA_FACTORY_ROLE, G_TYPE_STRING, m_options.user.c_str(), nullptr);
        gchar* basic = gst_rtsp_auth_make_basic(m_options.user.c_str(), m_options.password.c_str());
        gst_rtsp_auth_add_basic(auth, basic, token);
        g_free(basic);
        gst_rtsp_token_unref(token);
        gst_rtsp_server_set_auth(m_server, auth);
        g_object_unref(auth);
    }
    addFactory(m_options.path, m_options.launch);
    if (!m_options.lowLaunch.empty()) {
        addFactory(m_options.lowPath, m_options.lowLaunch);
    }
    Callbacks::connect(m_server, "client-connected", G_CALLBACK(Callbacks::connected), m_state);
    if (gst_rtsp_server_attach(m_server, m_context) == 0) {
        throw std::runtime_error("the RTSP server does not start");
    }
    m_port = gst_rtsp_server_get_bound_port(m_server);
    m_thread = std::thread([this] {
        g_main_context_push_thread_default(m_context);
        g_main_loop_run(m_loop);
        g_main_context_pop_thread_default(m_context);
    });
}

RtspServer::~RtspServer() {
    GList* removed = gst_rtsp_server_client_filter(m_server, Callbacks::removeClient, nullptr);
    g_list_free_full(removed, g_object_unref);
    GstRTSPSessionPool* pool = gst_rtsp_server_get_session_pool(m_server);
    gst_rtsp_session_pool_filter(
        pool, [](GstRTSPSessionPool*, GstRTSPSession*, gpointer) { return GST_RTSP_FILTER_REMOVE; }, nullptr);
    g_object_unref(pool);
    GSource* quit = g_idle_source_new();
    g_source_set_priority(quit, G_PRIORITY_LOW);
    g_source_set_callback(
        quit,
        [](gpointer loop) -> gboolean {
            g_main_loop_quit(static_cast<GMainLoop*>(loop));
            return G_SOURCE_REMOVE;
        },
        m_loop, nullptr);
    g_source_attach(quit, m_context);
    g_source_unref(quit);
    m_thread.join();
    Callbacks::keep(*m_state, nullptr, true);
    GSource* listener = g_main_context_find_source_by_id(m_context, 1);
    if (listener != nullptr) {
        g_source_destroy(listener);
    }
    g_object_unref(m_server);
    g_main_loop_unref(m_loop);
    g_main_context_unref(m_context);
}

std::string RtspServer::url(const std::string& path) const {
    const bool isIpv6 = m_options.address.find(':') != std::string::npos;
    std::string host = m_options.address;
    if (const std::size_t zone = host.find('%'); zone != std::string::npos) {
        host.replace(zone, 1, "%25"); // as a URL has it
    }
    return "rtsp://" + (isIpv6 ? "[" + host + "]" : host) + ":" + std::to_string(m_port) + path;
}

void RtspServer::addFactory(const std::string& path, const std::string& launch) {
    GstRTSPMountPoints* mounts = gst_rtsp_server_get_mount_points(m_server);
    GstRTSPMediaFactory* factory = gst_rtsp_media_factory_new();
    gst_rtsp_media_factory_set_launch(factory, ("( " + launch + " )").c_str());
    gst_rtsp_media_factory_set_shared(factory, TRUE);
    gst_rtsp_media_factory_set_latency(factory, 0);
    gst_rtsp_media_factory_set_protocols(
        factory, m_options.tcpOnly ? GST_RTSP_LOWER_TRANS_TCP
                 : m_options.udpOnly
                     ? GST_RTSP_LOWER_TRANS_UDP
                     : static_cast<GstRTSPLowerTrans>(GST_RTSP_LOWER_TRANS_TCP | GST_RTSP_LOWER_TRANS_UDP));
    if (!m_options.user.empty()) {
        GstRTSPPermissions* permissions = gst_rtsp_permissions_new();
        gst_rtsp_permissions_add_role(permissions, m_options.user.c_str(), GST_RTSP_PERM_MEDIA_FACTORY_ACCESS,
                                      G_TYPE_BOOLEAN, TRUE, GST_RTSP_PERM_MEDIA_FACTORY_CONSTRUCT, G_TYPE_BOOLEAN, TRUE,
                                      nullptr);
        gst_rtsp_media_factory_set_permissions(factory, permissions);
        gst_rtsp_permissions_unref(permissions);
    }
    Callbacks::connect(factory, "media-configure", G_CALLBACK(Callbacks::configure), m_state);
    gst_rtsp_mount_points_add_factory(mounts, path.c_str(), factory);
    g_object_unref(mounts);
}

namespace {

/// Sets a property of a source between two of its buffers, on the thread that makes them: the test picture's source
/// draws on with what another thread is just taking away.
void setBetweenBuffers(GstElement* source, const std::string& property, const std::string& value) {
    struct Change {
        GstElement* source;
        std::string property;
        std::string value;
        std::promise<void> made;
    };
    auto change = std::make_unique<Change>(Change{source, property, value, {}});
    const std::future<void> made = change->made.get_future();
    GstPad* pad = gst_element_get_static_pad(source, "src");
    gst_pad_add_probe(
        pad, GST_PAD_PROBE_TYPE_BUFFER,
        [](GstPad*, GstPadProbeInfo*, gpointer data) {
            auto& asked = *static_cast<Change*>(data);
            gst_util_set_object_arg(G_OBJECT(asked.source), asked.property.c_str(), asked.value.c_str());
            asked.made.set_value();
            return GST_PAD_PROBE_REMOVE;
        },
        change.release(), [](gpointer data) { std::default_delete<Change>()(static_cast<Change*>(data)); });
    gst_object_unref(pad);
    if (made.wait_for(std::chrono::seconds(10)) != std::future_status::ready) {
        throw std::runtime_error("the source makes no buffers");
    }
}

} // namespace

void RtspServer::set(const std::string& element, const std::string& property, const std::string& value) {
    const std::lock_guard guard(m_state->mutex);
    GstElement* found =
        m_state->pipeline != nullptr ? gst_bin_get_by_name(GST_BIN(m_state->pipeline), element.c_str()) : nullptr;
    if (found == nullptr) {
        throw std::runtime_error("there is no running element " + element);
    }
    if (GST_OBJECT_FLAG_IS_SET(found, GST_ELEMENT_FLAG_SOURCE)) {
        setBetweenBuffers(found, property, value);
    } else {
        gst_util_set_object_arg(G_OBJECT(found), property.c_str(), value.c_str());
    }
    gst_object_unref(found);
}

namespace {

std::string pictures(const std::string& caps, const std::string& pattern) {
    return "videotestsrc name=pattern is-live=true do-timestamp=true pattern=" + pattern +
           " ! capsfilter name=size caps=\"video/x-raw,format=I420," + caps + "\"";
}

} // namespace

std::string h264(const std::string& caps, const std::string& pattern) {
    return pictures(caps, pattern) + " ! x264enc tune=zerolatency speed-preset=ultrafast key-int-max=15 bitrate=4000"
                                     " ! rtph264pay name=pay0 pt=96 config-interval=-1";
}

std::string h265(const std::string& caps, const std::string& pattern) {
    return pictures(caps, pattern) + " ! x265enc tune=zerolatency speed-preset=ultrafast key-int-max=15 log-level=none"
                                     " ! rtph265pay name=pay0 pt=96 config-interval=-1";
}

std::string jpeg(const std::string& caps, const std::string& pattern) {
    return pictures(caps, pattern) + " ! jpegenc quality=95 ! rtpjpegpay name=pay0 pt=26";
}

} // namespace qivo::test
