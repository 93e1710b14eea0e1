#pragma once

#include "ptz/HoldButton.h"
#include "sdk/qivo.h"

#include <QObject>
#include <QPointer>
#include <QWidget>

class QAbstractSlider;

namespace qivo {

class AppData;

/// The controller of the panel that steers the camera behind the selected source. It keeps no state of the camera and
/// no receiver: every command goes to the receiver that the model has at that moment, also if there is none, which the
/// library refuses. What the library answers is ignored.
///
/// Once the model has lost control of a camera the panel's window closes.
///
/// Thread: main. The model may announce its change on any thread.
class PTZViewController : public QObject {
    Q_OBJECT

  public:
    /// Of every motion that the panel starts, as a part of the camera's highest. Left, up and in are positive.
    static constexpr float kSpeed = 0.1F;
    static constexpr float kRecallSpeed = 0.25F;

    /// As the interface file makes it: knows the shared model and observes it. The view is borrowed.
    explicit PTZViewController(QWidget* view);
    ~PTZViewController() override;

    QWidget* view() const { return m_view; }
    AppData* theModel() const { return _theModel; }

    /// The button that gets extra stops. To be set before the view has loaded.
    HoldButton* zoomOutBtn() const { return _zoomOutBtn; }
    void setZoomOutBtn(HoldButton* button) { _zoomOutBtn = button; }
    /// On: the next preset button stores, and turns it off.
    QAbstractButton* storePresetBtn() const { return _storePresetBtn; }
    void setStorePresetBtn(QAbstractButton* button) { _storePresetBtn = button; }

    /// Sets up the stops of the zoom-out button, as large as it is by now; the first time only.
    void viewDidLoad();

    /// The commands. A motion runs at the fixed speed if the left mouse button is down when the command arrives, and
    /// stops otherwise.
    void DoZoomIn();
    void DoZoomOut();
    void DoPanLeft();
    void DoPanRight();
    void DoTiltUp();
    void DoTiltDown();
    void DoAutofocus();
    /// Sends the slider's value as a part of its maximum; its minimum must be 0.
    void DoFocusSlider(const QAbstractSlider* sender);
    /// Recalls the preset that the sender's property "tag" numbers, or stores it in store mode.
    void DoPresetButton(const QObject* sender);

    /// Motion that no mouse button holds. Each direction is -1, 0 or 1.
    void zoomToward(int direction);
    void panTiltToward(int pan, int tilt);

    /// "hasPTZControl": closes the window if the model has no control of a camera. "cell.state" of the zoom-out button:
    /// stops zooming. Anything else is ignored.
    void observeValueForKeyPath(const QString& keyPath, const QObject* ofObject);

    /// The pointer came onto, or left, the zoom-out button.
    void mouseEntered();
    void mouseExited();

  private:
    QIVOlib_recv_instance_t receiver() const;

    bool _viewLoaded = false;
    AppData* _theModel; // lives for ever
    QPointer<HoldButton> _zoomOutBtn;
    QPointer<QAbstractButton> _storePresetBtn;
    QPointer<QWidget> m_view;
};

} // namespace qivo
