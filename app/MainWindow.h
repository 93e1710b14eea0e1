#pragma once

#include <QMainWindow>
#include <QPointer>

namespace qivo {

class ViewController;

/// The window that shows the picture. Views of the title bar stand at the end of its menu bar.
///
/// In full screen the menu bar takes no room, yet keys reach it; it comes back while the pointer is at the upper edge
/// or a menu is open.
///
/// Thread: main.
class MainWindow : public QMainWindow {
    Q_OBJECT

  public:
    /// How near to the upper edge of a full screen the pointer brings the menu bar back, in pixels of the toolkit.
    static constexpr int kRevealDistance = 3;

    explicit MainWindow(QWidget* parent = nullptr);
    ~MainWindow() override;

    /// Not owned; null if there is none.
    ViewController* contentViewController() const;
    void setContentViewController(ViewController* controller);

    /// Puts a view at the right end of the menu bar; the window owns it from then on.
    void addTitleBarAccessory(QWidget* view);

  public slots:
    void setFullScreen(bool yes);

  signals:
    /// Once per close, before the window goes; a window that is destroyed open does not send it.
    void willClose();
    void fullScreenChanged(bool yes);

  protected:
    void closeEvent(QCloseEvent* event) override;
    void changeEvent(QEvent* event) override;
    bool eventFilter(QObject* watched, QEvent* event) override;

  private:
    void fullScreenDidChange();
    void placeMenuBar();
    bool menuBarIsWanted() const;

    QPointer<ViewController> m_contentViewController;
    bool m_isFullScreen = false;
};

} // namespace qivo
