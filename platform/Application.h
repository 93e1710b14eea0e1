#pragma once

class QString;
class QWidget;

namespace qivo {

/// The application's main window, or null while there is none. A window that is destroyed is forgotten by itself.
///
/// Thread: main.
QWidget* mainWindow();

/// Makes a window the main one; null for none. The window is borrowed.
void setMainWindow(QWidget* window);

/// Titles the main window literally; nothing without one.
void setMainWindowTitle(const QString& title);

} // namespace qivo
