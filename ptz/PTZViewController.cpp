#include "ptz/PTZViewController.h"

#include "app/AppData.h"
#include "platform/Log.h"
#include "platform/PointerState.h"
#include "platform/TrackingArea.h"

#include <QAbstractSlider>
#include <QVariant>

#include <cstdio>
#include <memory>

namespace qivo {
namespace {

const QLatin1String kHasPTZControl("hasPTZControl");
const QLatin1String kCellState("cell.state");

/// The speed that an action stands for: nothing once the left mouse button has been let go.
float speedWhileHeld(float speed) {
    constexpr unsigned kLeftButton = 1;
    return (pressedMouseButtons() & kLeftButton) != 0 ? speed : 0.0F;
}

} // namespace

PTZViewController::PTZViewController(QWidget* view) : _theModel(AppData::inst()), m_view(view) {
    // The context brings a notice from another thread to this one.
    connect(_theModel, &AppData::hasPTZControlChanged, this,
            [this] { observeValueForKeyPath(kHasPTZControl, _theModel); });
}

PTZViewController::~PTZViewController() = default;

void PTZViewController::viewDidLoad() {
    if (_viewLoaded || _zoomOutBtn == nullptr) {
        return;
    }
    connect(_zoomOutBtn, &HoldButton::stateChanged, this, [this] { observeValueForKeyPath(kCellState, _zoomOutBtn); });
    // The button owns its area.
    const auto* area = std::make_unique<TrackingArea>(_zoomOutBtn, _zoomOutBtn->rect()).release();
    connect(area, &TrackingArea::mouseEntered, this, &PTZViewController::mouseEntered);
    connect(area, &TrackingArea::mouseExited, this, &PTZViewController::mouseExited);
    _viewLoaded = true;
}

QIVOlib_recv_instance_t PTZViewController::receiver() const {
    return _theModel->ptzSource();
}

void PTZViewController::DoZoomIn() {
    QIVOlib_recv_ptz_zoom_speed(receiver(), speedWhileHeld(kSpeed));
}

void PTZViewController::DoZoomOut() {
    QIVOlib_recv_ptz_zoom_speed(receiver(), speedWhileHeld(-kSpeed));
}

void PTZViewController::DoPanLeft() {
    QIVOlib_recv_ptz_pan_tilt_speed(receiver(), speedWhileHeld(kSpeed), 0.0F);
}

void PTZViewController::DoPanRight() {
    QIVOlib_recv_ptz_pan_tilt_speed(receiver(), speedWhileHeld(-kSpeed), 0.0F);
}

void PTZViewController::DoTiltUp() {
    QIVOlib_recv_ptz_pan_tilt_speed(receiver(), 0.0F, speedWhileHeld(kSpeed));
}

void PTZViewController::DoTiltDown() {
    QIVOlib_recv_ptz_pan_tilt_speed(receiver(), 0.0F, speedWhileHeld(-kSpeed));
}

void PTZViewController::DoAutofocus() {
    QIVOlib_recv_ptz_auto_focus(receiver());
}

void PTZViewController::DoFocusSlider(const QAbstractSlider* sender) {
    QIVOlib_recv_ptz_focus(receiver(), static_cast<float>(sender->value()) / static_cast<float>(sender->maximum()));
}

void PTZViewController::DoPresetButton(const QObject* sender) {
    const int preset = sender->property("tag").toInt();
    if (_storePresetBtn != nullptr && _storePresetBtn->isChecked()) {
        QIVOlib_recv_ptz_store_preset(receiver(), preset);
        _storePresetBtn->setChecked(false);
    } else {
        QIVOlib_recv_ptz_recall_preset(receiver(), preset, kRecallSpeed);
    }
}

void PTZViewController::zoomToward(int direction) {
    QIVOlib_recv_ptz_zoom_speed(receiver(), static_cast<float>(direction) * kSpeed);
}

void PTZViewController::panTiltToward(int pan, int tilt) {
    QIVOlib_recv_ptz_pan_tilt_speed(receiver(), static_cast<float>(pan) * kSpeed, static_cast<float>(tilt) * kSpeed);
}

void PTZViewController::observeValueForKeyPath(const QString& keyPath, const QObject* ofObject) {
    if (keyPath == kHasPTZControl) {
        if (!_theModel->hasPTZControl() && m_view != nullptr) {
            m_view->window()->close();
        }
    } else if (keyPath == kCellState && ofObject == _zoomOutBtn) {
        std::puts("Stopping zoom out");
        std::fflush(stdout);
        zoomToward(0);
    }
}

void PTZViewController::mouseEntered() {
    logLine("entered");
}

void PTZViewController::mouseExited() {
    logLine("exited");
    zoomToward(0);
}

} // namespace qivo
