#pragma once

#include <QToolButton>

namespace qivo {

/// A button for what goes on while it is held. `pressed` is sent when the left mouse button goes down on it, and
/// `released` once when that goes up again, wherever the pointer is by then. Dragging off and back on sends nothing.
///
/// A press that is let go on the button moves its state on, from 0 to 1 and back. The state is not shown.
///
/// Thread: main.
class HoldButton : public QToolButton {
    Q_OBJECT
    Q_PROPERTY(int state READ state WRITE setState NOTIFY stateChanged)

  public:
    explicit HoldButton(QWidget* parent = nullptr);

    int state() const { return m_state; }
    void setState(int state);

  signals:
    /// Only where the state differs from the one before.
    void stateChanged(int state);
    /// The button is held, but its window lost the keyboard or went away, so that `released` may come late or never.
    void interrupted();

  protected:
    void mousePressEvent(QMouseEvent* event) override;
    void mouseMoveEvent(QMouseEvent* event) override;
    void mouseReleaseEvent(QMouseEvent* event) override;
    bool event(QEvent* event) override;

  private:
    void letGo();

    bool m_isHeld = false;
    int m_state = 0;
};

} // namespace qivo
