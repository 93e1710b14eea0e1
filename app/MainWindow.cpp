#include "app/MainWindow.h"

#include "app/ViewController.h"

#include <QApplication>
#include <QCloseEvent>
#include <QCursor>
#include <QMenuBar>

namespace qivo {

MainWindow::MainWindow(QWidget* parent) : QMainWindow(parent) {}

MainWindow::~MainWindow() = default;

ViewController* MainWindow::contentViewController() const {
    return m_contentViewController;
}

void MainWindow::setContentViewController(ViewController* controller) {
    m_contentViewController = controller;
}

void MainWindow::addTitleBarAccessory(QWidget* view) {
    menuBar()->setCornerWidget(view, Qt::TopRightCorner);
    view->show();
}

void MainWindow::setFullScreen(bool yes) {
    setWindowState(windowState().setFlag(Qt::WindowFullScreen, yes));
}

void MainWindow::closeEvent(QCloseEvent* event) {
    emit willClose();
    QMainWindow::closeEvent(event);
}

void MainWindow::changeEvent(QEvent* event) {
    QMainWindow::changeEvent(event);
    if (event->type() == QEvent::WindowStateChange && m_isFullScreen != isFullScreen()) {
        fullScreenDidChange();
    }
}

/// The window manager may have changed it without being asked by us.
void MainWindow::fullScreenDidChange() {
    m_isFullScreen = isFullScreen();
    if (m_isFullScreen) {
        qApp->installEventFilter(this);
    } else {
        qApp->removeEventFilter(this);
    }
    placeMenuBar();
    emit fullScreenChanged(m_isFullScreen);
}

/// The picture is a native window of its own, so that only the application as a whole sees where the pointer goes.
bool MainWindow::eventFilter(QObject* watched, QEvent* event) {
    switch (event->type()) {
    case QEvent::Move:
    case QEvent::Resize:
    case QEvent::MouseMove:
    case QEvent::Enter:
    case QEvent::Leave: // to another screen
    case QEvent::MouseButtonRelease:
    case QEvent::KeyRelease:
    case QEvent::Show:
    case QEvent::Hide:
        placeMenuBar();
        break;
    default:
        break;
    }
    return QMainWindow::eventFilter(watched, event);
}

/// A menu bar that is hidden would take its keys and shortcuts with it; one without height keeps them.
void MainWindow::placeMenuBar() {
    const int height = !m_isFullScreen || menuBarIsWanted() ? QWIDGETSIZE_MAX : 0;
    if (menuBar()->maximumHeight() != height) {
        menuBar()->setMaximumHeight(height);
    }
}

bool MainWindow::menuBarIsWanted() const {
    const int reach = menuBar()->maximumHeight() > 0 ? menuBar()->sizeHint().height() : kRevealDistance;
    return QApplication::activePopupWidget() != nullptr || menuBar()->activeAction() != nullptr ||
           QRect(0, 0, width(), reach).contains(mapFromGlobal(QCursor::pos()));
}

} // namespace qivo
