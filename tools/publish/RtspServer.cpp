#include "tools/publish/RtspServer.h"

namespace qivo {
namespace {

void onPlay(GstRTSPClient*, GstRTSPContext* context, gpointer) {
    if (context->media != nullptr) {
        requestKeyPicture(context->media);
    }
}

void onClientConnected(GstRTSPServer*, GstRTSPClient* client, gpointer) {
    g_signal_connect(client, "play-request", G_CALLBACK(onPlay), nullptr);
}

} // namespace

RtspServer::RtspServer() : m_server(gst_rtsp_server_new()) {
    g_signal_connect(m_server.get(), "client-connected", G_CALLBACK(onClientConnected), nullptr);
}

RtspServer::~RtspServer() {
    stop();
}

void RtspServer::mount(const std::string& path, Object<GstRTSPMediaFactory> factory) {
    const Object<GstRTSPMountPoints> mounts(gst_rtsp_server_get_mount_points(m_server.get()));
    gst_rtsp_mount_points_add_factory(mounts.get(), path.c_str(), factory.release());
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
    m_source = 0;
    const auto remove = [](GstRTSPServer*, GstRTSPClient*, gpointer) { return GST_RTSP_FILTER_REMOVE; };
    g_list_free_full(gst_rtsp_server_client_filter(m_server.get(), remove, nullptr), g_object_unref);
    const Object<GstRTSPSessionPool> sessions(gst_rtsp_server_get_session_pool(m_server.get()));
    const auto removeSession = [](GstRTSPSessionPool*, GstRTSPSession*, gpointer) { return GST_RTSP_FILTER_REMOVE; };
    g_list_free_full(gst_rtsp_session_pool_filter(sessions.get(), removeSession, nullptr), g_object_unref);
}

} // namespace qivo
