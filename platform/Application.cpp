#include "platform/Application.h"

#include <QPointer>
#include <QString>
#include <QWidget>

namespace qivo {
namespace {

QPointer<QWidget>& theMainWindow() {
    static QPointer<QWidget> window;
    return window;
}

} // namespace

QWidget* mainWindow() {
    return theMainWindow();
}

void setMainWindow(QWidget* window) {
    theMainWindow() = window;
}

void setMainWindowTitle(const QString& title) {
    if (QWidget* window = mainWindow()) {
        // The toolkit takes "[*]" for the place of its mark of changed documents; doubled, it stands for itself.
        window->setWindowTitle(QString(title).replace(QLatin1String("[*]"), QLatin1String("[*][*]")));
    }
}

} // namespace qivo
