#include "app/ApplicationMain.h"

#include "app/Interface.h"
#include "app/MainWindow.h"
#include "platform/Log.h"
#include "platform/StartUp.h"
#include "platform/TerminationSignals.h"
#include "sdk/Loader.h"

#include <QApplication>

namespace qivo {
namespace {

std::unique_ptr<QApplication> makeApplication(int& argc, char** argv) {
    QGuiApplication::setHighDpiScaleFactorRoundingPolicy(Qt::HighDpiScaleFactorRoundingPolicy::PassThrough);
    const MissingDisplayGuard guard;
    auto application = std::make_unique<QApplication>(argc, argv);
    QCoreApplication::setApplicationName(QStringLiteral("qivo-viewer"));
    QGuiApplication::setDesktopFileName(QStringLiteral("qivo-viewer"));
    QGuiApplication::setWindowIcon(QIcon(QStringLiteral(":/icons/qivo-viewer.png")));
    return application;
}

/// What to do about it is up to the user, who needs the reason.
void reportMissingLibrary() {
    const std::string reason = loadError();
    if (!reason.empty()) {
        logLine("No sources can be shown, because libqivo cannot be used: %s", reason.c_str());
    }
}

} // namespace

int applicationMain(int argc, char** argv) {
    const auto application = makeApplication(argc, argv);
    const TerminationSignals signalsToEnd;
    Interface interface;
    QObject::connect(&signalsToEnd, &TerminationSignals::received, &interface, &Interface::terminate);
    reportMissingLibrary();
    AppDelegate& delegate = interface.delegate();
    QGuiApplication::setQuitOnLastWindowClosed(delegate.applicationShouldTerminateAfterLastWindowClosed());
    QObject::connect(application.get(), &QApplication::aboutToQuit, &delegate, &AppDelegate::applicationWillTerminate);
    interface.window().show();
    delegate.applicationDidFinishLaunching();
    return QApplication::exec();
}

} // namespace qivo
