#pragma once

#include "app/AppData.h"

#include <QObject>
#include <QPointer>
#include <QWidget>

#include <memory>

namespace qivo {

class MainWindow;

/// The main window's controller: puts the switches into the title bar, and ends a recording when the window closes.
///
/// Thread: main.
class WindowController : public QObject {
    Q_OBJECT

  public:
    /// The window is borrowed.
    explicit WindowController(MainWindow* window, QObject* parent = nullptr);
    ~WindowController() override;

    /// The view for the right of the title bar, to be set before the window has loaded. Owned until it is placed.
    QWidget* accessoryView() const { return m_accessoryView; }
    void setAccessoryView(std::unique_ptr<QWidget> view);

    /// The window has come out of the interface file.
    void windowDidLoad();

    /// Places the accessory view, the first time.
    void createAccessoryViewControllerIfNeeded();

    void windowWillClose();

    AppData* getTheModel() const;

  private:
    QPointer<MainWindow> m_window;
    QPointer<QWidget> m_accessoryView;
    std::unique_ptr<QWidget> m_unplacedView;
    bool m_accessoryIsPlaced = false;
};

} // namespace qivo
