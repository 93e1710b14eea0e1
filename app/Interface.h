#pragma once

#include "app/AppDelegate.h"

#include <QList>
#include <QObject>
#include <QPointer>

#include <memory>

namespace Ui {
class MainWindow;
} // namespace Ui

namespace qivo {

class MainWindow;
class PTZPanel;
class ViewController;
class WindowController;

/// Everything that the interface files describe, made and connected: the application's controller, then the menus, the
/// main window with its controllers and the switches of its title bar. The controller is made first and goes last,
/// because it holds the QIVO library.
///
/// Thread: main.
class Interface : public QObject {
    Q_OBJECT

  public:
    Interface();
    ~Interface() override;

    AppDelegate& delegate() { return *m_delegate; }
    MainWindow& window() { return *m_window; }
    WindowController& windowController() { return *m_windowController; }
    ViewController& viewController() { return *m_viewController; }
    /// The panel for the camera; null while it is not open.
    PTZPanel* ptzPanel() const;

    /// Ends the application in the controller's order. The toolkit's own way to quit would close the window first, and
    /// with it a recording, before the player and the finder.
    static void terminate();

    /// Enables and disables a menu's commands as the controller says. Entries without a command stay as they are.
    void validateMenu(QMenu* menu) const;

  private:
    void loadMenus();
    void loadTitleBar();
    void loadSegues();
    void showPTZPanel();
    void takeTags();
    void addCommand(QAction* item, void (AppDelegate::*command)());
    void validateAllMenus() const;

    std::unique_ptr<AppDelegate> m_delegate;
    std::unique_ptr<Ui::MainWindow> m_ui;
    std::unique_ptr<MainWindow> m_window;
    std::unique_ptr<ViewController> m_viewController;
    std::unique_ptr<WindowController> m_windowController;
    QList<QAction*> m_commands;    // the window's
    QPointer<PTZPanel> m_ptzPanel; // the window's; may have been closed
};

} // namespace qivo
