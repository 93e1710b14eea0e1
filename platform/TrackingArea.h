#pragma once

#include <QObject>
#include <QRect>

class QWidget;

namespace qivo {

/// Tells when the pointer comes into a rectangle of a view and when it goes out, whether the window is active or not,
/// and also while a mouse button is held: the toolkit itself tells of neither until that button is let go.
///
/// Thread: main.
class TrackingArea : public QObject {
    Q_OBJECT

  public:
    /// Watches a rectangle, in the view's coordinates. Where the view's size changes, its whole inside is watched from
    /// then on. The area belongs to the view.
    TrackingArea(QWidget* view, const QRect& rect);

  signals:
    void mouseEntered();
    void mouseExited();

  protected:
    bool eventFilter(QObject* watched, QEvent* event) override;

  private:
    void setInside(bool inside);

    QRect m_rect;
    bool m_isInside = false;
};

} // namespace qivo
