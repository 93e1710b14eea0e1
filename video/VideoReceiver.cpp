// The receiving half of VideoView: the connection rule, the capture pass and the tear-down.

#include "video/VideoView.h"

#include "app/AppData.h"
#include "gl/GLTexture.h"
#include "platform/Image.h"

#include <QByteArray>
#include <QStringDecoder>
#include <cstdio>
#include <mutex>

namespace qivo {
namespace {

void printLine(const char* text) {
    std::puts(text);
    std::fflush(stdout);
}

/// Null if the text is not UTF-8.
QString stringWithUTF8(const char* text) {
    QStringDecoder decoder(QStringDecoder::Utf8, QStringDecoder::Flag::Stateless);
    const QString decoded = decoder.decode(QByteArrayView(text));
    return decoder.hasError() ? QString() : decoded;
}

/// What the runtime is to read as a text: a missing one is a null pointer, an empty one is not. The bytes must outlive
/// the pointer.
const char* pointerTo(const QString& string, const QByteArray& utf8) {
    return string.isNull() ? nullptr : utf8.constData();
}

bool sameGeometry(const QIVOlib_video_frame_v2_t& one, const QIVOlib_video_frame_v2_t& other) {
    return one.yres == other.yres && one.xres == other.xres && one.line_stride_in_bytes == other.line_stride_in_bytes;
}

} // namespace

bool VideoView::createQIVOReceiver() {
    if (theModel->selectedQIVOSourceChangedCount() == _selectedQIVOSourceChangedCount &&
        theModel->isLowBandwidth() == _isLowBandwidth) {
        return m_pQIVO_recv != nullptr;
    }
    _isLowBandwidth = theModel->isLowBandwidth();
    if (m_pQIVO_recv != nullptr) {
        freeCapturedFrame();
        QIVOlib_recv_destroy(m_pQIVO_recv);
        m_pQIVO_recv = nullptr;
        theModel->setDeviceWebpageURL(QStringLiteral(""));
    }
    _connectedURL = QString();
    // Before the attempt, so that a failure is final until the next change.
    _selectedQIVOSourceChangedCount = theModel->selectedQIVOSourceChangedCount();
    QString name;
    QString url;
    theModel->getQIVOSourceInfoNamed(name, url);
    if (url.isEmpty() && name.isEmpty()) {
        return false;
    }
    m_pQIVO_recv = newReceiver(name, url);
    if (m_pQIVO_recv != nullptr) {
        _connectedURL = url;
    }
    return m_pQIVO_recv != nullptr;
}

QIVOlib_recv_instance_t VideoView::newReceiver(const QString& name, const QString& url) const {
    const QByteArray nameUtf8 = name.toUtf8();
    const QByteArray urlUtf8 = url.toUtf8();
    QIVOlib_recv_create_v3_t settings{};
    settings.source.p_name = pointerTo(name, nameUtf8);
    settings.source.p_url_address = pointerTo(url, urlUtf8);
    settings.color_format = QIVOlib_recv_color_format_rgba;
    settings.bandwidth = _isLowBandwidth ? QIVOlib_recv_bandwidth_lowest : QIVOlib_recv_bandwidth_highest;
    settings.allow_video_fields = false;
    settings.p_qivo_recv_name = nullptr;
    return QIVOlib_recv_create_v3(&settings);
}

bool VideoView::captureNewVideoSample() {
    if (!createQIVOReceiver()) {
        return false;
    }
    QIVOlib_video_frame_v2_t frame{};
    int32_t type = QIVOlib_recv_capture_v2(m_pQIVO_recv, &frame, nullptr, nullptr, 0);
    while (type == QIVOlib_frame_type_status_change) {
        handleStatusChange();
        type = QIVOlib_recv_capture_v2(m_pQIVO_recv, &frame, nullptr, nullptr, 0);
    }
    if (type != QIVOlib_frame_type_video) {
        return false;
    }
    showFrame(frame);
    freeCapturedFrame();
    holdFrame(frame);
    return true;
}

void VideoView::holdFrame(const QIVOlib_video_frame_v2_t& frame) {
    _captured_frame = frame;
    m_capturedAspect = frame.picture_aspect_ratio;
}

void VideoView::handleStatusChange() {
    const char* web = QIVOlib_recv_get_web_control(m_pQIVO_recv);
    if (web == nullptr) {
        return;
    }
    theModel->setDeviceWebpageURL(stringWithUTF8(web));
    QIVOlib_recv_free_string(m_pQIVO_recv, web);
    if (QIVOlib_recv_ptz_is_supported(m_pQIVO_recv)) {
        theModel->setPtzSource(m_pQIVO_recv);
    }
}

void VideoView::showFrame(const QIVOlib_video_frame_v2_t& frame) {
    if (sameGeometry(frame, _captured_frame)) {
        updateTexture(frame);
    } else {
        replaceTexture(frame);
    }
}

void VideoView::updateTexture(const QIVOlib_video_frame_v2_t& frame) {
    GLContext* context = openGLContext();
    context->makeCurrentContext();
    const std::lock_guard guard(*context);
    if (tex2D) {
        tex2D->setEnable(true);
        tex2D->setBind(true);
        tex2D->update(frame.p_data);
        tex2D->setBind(false);
        tex2D->setEnable(false);
    }
}

void VideoView::replaceTexture(const QIVOlib_video_frame_v2_t& frame) {
    BitmapLayout layout;
    layout.pixelsWide = frame.xres;
    layout.pixelsHigh = frame.yres;
    layout.bitsPerSample = 8;
    layout.samplesPerPixel = 4;
    layout.hasAlpha = true;
    layout.isPremultiplied = true;
    layout.isPlanar = false;
    layout.bytesPerRow = frame.line_stride_in_bytes;
    const auto rep = std::make_shared<BitmapImageRep>(layout, BitmapImageRep::Planes{frame.p_data});
    Image image(rep->size());
    image.addRepresentation(rep);
    GLContext* context = openGLContext();
    context->makeCurrentContext();
    const std::lock_guard guard(*context);
    setImage(image);
}

void VideoView::setImage(const Image& image) {
    tex2D.reset();
    tex2D = GLTexture::initWithImage(&image);
}

void VideoView::freeCapturedFrame() {
    if (_captured_frame.p_data != nullptr) {
        QIVOlib_recv_free_video_v2(m_pQIVO_recv, &_captured_frame);
        _captured_frame.p_data = nullptr;
    }
}

void VideoView::closeQIVOReceiver() {
    theModel->clearPTZSource();
    if (m_pQIVO_recv == nullptr) {
        return;
    }
    freeCapturedFrame();
    printLine("Destroying the QIVO receiver ");
    QIVOlib_recv_destroy(m_pQIVO_recv);
    printLine("The QIVO receiver has been destroyed ");
    m_pQIVO_recv = nullptr;
    _connectedURL = QString();
    theModel->setDeviceWebpageURL(QStringLiteral(""));
}

} // namespace qivo
