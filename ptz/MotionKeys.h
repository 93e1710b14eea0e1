#pragma once

#include <QObject>

#include <vector>

class QKeyEvent;
class QWidget;

namespace qivo {

/// The keys of a window that steer a camera: arrows move and plus and minus zoom while they are held, digits name
/// presets. They work wherever in the window the keyboard is, and are seen by nobody else. Keys that are held together
/// add up; opposite ones cancel each other. A window that loses the keyboard or is hidden counts as all keys let go.
///
/// Thread: main.
class MotionKeys : public QObject {
    Q_OBJECT

  public:
    /// The keys of that top-level window, which must outlive this object.
    explicit MotionKeys(QWidget* window);

    /// Tells the motion of the keys that are held once more, if any are: something else has put an end to it.
    void tellAgain();

  signals:
    /// The direction that the held keys make up has changed, each part -1, 0 or 1: left and up are positive. Repeated
    /// where a key changes nothing, so that the last letting go is always told.
    void panTilt(int pan, int tilt);
    /// The same for zooming; in is positive.
    void zoom(int direction);
    /// A digit from 1 to 9 went down.
    void preset(int number);

  protected:
    bool eventFilter(QObject* watched, QEvent* event) override;

  private:
    struct Motion {
        int pan = 0;
        int tilt = 0;
        int zoom = 0;
    };
    struct HeldKey {
        int key = 0;
        quint32 scanCode = 0;
        Motion motion;
    };

    void watchKeys(const QWidget& window);
    static Motion motionOf(const QKeyEvent& event);
    bool handlePress(const QKeyEvent& event);
    bool handleRelease(const QKeyEvent& event);
    std::vector<HeldKey>::iterator find(const QKeyEvent& event);
    void letAllGo();
    void announce(const Motion& changed);

    std::vector<HeldKey> m_held;
};

} // namespace qivo
