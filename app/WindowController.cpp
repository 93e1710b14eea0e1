#include "app/WindowController.h"

#include "app/MainWindow.h"

#include <utility>

namespace qivo {

WindowController::WindowController(MainWindow* window, QObject* parent) : QObject(parent), m_window(window) {
    connect(window, &MainWindow::willClose, this, &WindowController::windowWillClose);
}

WindowController::~WindowController() = default;

void WindowController::setAccessoryView(std::unique_ptr<QWidget> view) {
    m_unplacedView = std::move(view);
    m_accessoryView = m_unplacedView.get();
}

void WindowController::windowDidLoad() {
    createAccessoryViewControllerIfNeeded();
}

void WindowController::createAccessoryViewControllerIfNeeded() {
    if (!m_accessoryIsPlaced && m_window && m_unplacedView) {
        m_window->addTitleBarAccessory(m_unplacedView.release());
        m_accessoryIsPlaced = true;
    }
}

void WindowController::windowWillClose() {
    getTheModel()->setIsRecording(false);
}

AppData* WindowController::getTheModel() const {
    return AppData::inst();
}

} // namespace qivo
