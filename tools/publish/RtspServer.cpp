#include "tools/publish/RtspServer.h"

namespace qivo {
namespace {

constexpr const char* viewerRole = "viewer";
constexpr guint pictureStream = 0; // of a media, by its payloader's number
constexpr guint secondsBetweenCleanups = 1;

void onPlay(GstRTSPClient*, GstRTSPContext* context, gpointer) {
    if (context->media != nullptr) {
        requestKeyPicture(context->media);
    }
}

void onNewSession(GstRTSPClient*, GstRTSPSession* session, gpointer timeout) {
    gst_rtsp_session_set_timeout(session, GPOINTER_TO_UINT(timeout));
}

void onClientConnected(GstRTSPServer*, GstRTSPClient* client, gpointer timeout) {
    g_signal_connect(client, "new-session", G_CALLBACK(onNewSession), timeout);
    g_signal_connect(client, "play-request", G_CALLBACK(onPlay), nullptr);
}

// The server looks for sessions that have run out only when it is told to.
gboolean onCleanup(gpointer server) {
    const Object<GstRTSPSessionPool> sessions(gst_rtsp_server_get_session_pool(static_cast<GstRTSPServer*>(server)));
    gst_rtsp_session_pool_cleanup(sessions.get());
    return G_SOURCE_CONTINUE;
}

} // namespace

RtspServer::RtspServer(std::chrono::seconds sessionTimeout) : m_server(gst_rtsp_server_new()) {
    g_signal_connect(m_server.get(), "client-connected", G_CALLBACK(onClientConnected),
                     GUINT_TO_POINTER(static_cast<guint>(sessionTimeout.count())));
}

RtspServer::~RtspServer() {
    stop();
}

void RtspServer::requireLogin(const Login& login) {
    const Object<GstRTSPAuth> auth(gst_rtsp_auth_new());
    gst_rtsp_auth_set_supported_methods(auth.get(), GST_RTSP_AUTH_DIGEST);
    gst_rtsp_auth_set_realm(auth.get(), loginRealm);
    GstRTSPToken* token = gst_rtsp_token_new(GST_RTSP_TOKEN_MEDIA_FACTORY_ROLE, G_TYPE_STRING, viewerRole, nullptr);
    gst_rtsp_auth_add_digest(auth.get(), login.user.c_str(), login.password.c_str(), token);
    gst_rtsp_token_unref(token);
    gst_rtsp_server_set_auth(m_server.get(), auth.get());
    m_loginNeeded = true;
}

void RtspServer::mount(const std::string& path, Object<GstRTSPMediaFactory> factory) {
    if (m_loginNeeded) {
        gst_rtsp_media_factory_add_role(factory.get(), viewerRole, GST_RTSP_PERM_MEDIA_FACTORY_ACCESS, G_TYPE_BOOLEAN,
                                        TRUE, GST_RTSP_PERM_MEDIA_FACTORY_CONSTRUCT, G_TYPE_BOOLEAN, TRUE, nullptr);
    }
    const Object<GstRTSPMountPoints> mounts(gst_rtsp_server_get_mount_points(m_server.get()));
    gst_rtsp_mount_points_add_factory(mounts.get(), path.c_str(), factory.release());
}

int RtspServer::viewers(const std::string& path) const {
    struct Count {
        const std::string& path;
        int playing;
    } count{path, 0};
    const Object<GstRTSPSessionPool> sessions(gst_rtsp_server_get_session_pool(m_server.get()));
    const auto look = [](GstRTSPSessionPool*, GstRTSPSession* session, gpointer data) {
        auto* found = static_cast<Count*>(data);
        gint matched = 0;
        GstRTSPSessionMedia* media = gst_rtsp_session_get_media(session, found->path.c_str(), &matched);
        const bool whole = media != nullptr && matched == static_cast<gint>(found->path.size());
        const bool playing = whole && gst_rtsp_session_media_get_rtsp_state(media) == GST_RTSP_STATE_PLAYING;
        // Many a viewer takes the sound in a session of its own; whoever takes no picture is not counted.
        found->playing += playing && gst_rtsp_session_media_get_transport(media, pictureStream) != nullptr ? 1 : 0;
        return GST_RTSP_FILTER_KEEP;
    };
    g_list_free_full(gst_rtsp_session_pool_filter(sessions.get(), look, &count), g_object_unref);
    return count.playing;
}

bool RtspServer::attach(int port, std::string& reason) {
    gst_rtsp_server_set_service(m_server.get(), std::to_string(port).c_str());
    GError* failure = nullptr;
    GSource* source = gst_rtsp_server_create_source(m_server.get(), nullptr, &failure);
    const Error error(failure);
    if (source == nullptr) {
        reason = error ? error->message : "unknown reason";
        return false;
    }
    m_source = g_source_attach(source, nullptr);
    g_source_unref(source);
    return true;
}

std::string RtspServer::listen(int port, bool loopbackOnly) {
    gst_rtsp_server_set_address(m_server.get(), loopbackOnly ? "127.0.0.1" : "0.0.0.0");
    std::string reason;
    const bool anyWillDo = port < 0;
    if (attach(anyWillDo ? preferredPort : port, reason) || (anyWillDo && attach(0, reason))) {
        m_cleanup = g_timeout_add_seconds(secondsBetweenCleanups, onCleanup, m_server.get());
        return {};
    }
    return "cannot serve at port " + std::to_string(port) + ": " + reason +
           "; choose another with --port, or --port 0 for any free one";
}

int RtspServer::port() const {
    return gst_rtsp_server_get_bound_port(m_server.get());
}

void RtspServer::stop() {
    if (m_source == 0) {
        return;
    }
    g_source_remove(m_source);
    g_source_remove(m_cleanup);
    m_source = 0;
    const auto remove = [](GstRTSPServer*, GstRTSPClient*, gpointer) { return GST_RTSP_FILTER_REMOVE; };
    g_list_free_full(gst_rtsp_server_client_filter(m_server.get(), remove, nullptr), g_object_unref);
    const Object<GstRTSPSessionPool> sessions(gst_rtsp_server_get_session_pool(m_server.get()));
    const auto removeSession = [](GstRTSPSessionPool*, GstRTSPSession*, gpointer) { return GST_RTSP_FILTER_REMOVE; };
    g_list_free_full(gst_rtsp_session_pool_filter(sessions.get(), removeSession, nullptr), g_object_unref);
}

} // namespace qivo
