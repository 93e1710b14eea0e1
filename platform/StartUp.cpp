#include "platform/StartUp.h"

#include <QByteArray>
#include <QString>
#include <QtGlobal>

#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace qivo {
namespace {

QtMessageHandler usualHandler = nullptr;

QByteArray displayTried() {
    for (const char* name : {"QT_QPA_PLATFORM", "WAYLAND_DISPLAY", "DISPLAY"}) {
        const QByteArray value = qgetenv(name);
        if (!value.isEmpty()) {
            return QByteArray(name) + " is \"" + value + "\"";
        }
    }
    return "neither DISPLAY nor WAYLAND_DISPLAY is set";
}

/// The toolkit cannot be asked beforehand whether a display answers; it tries its plugins one after another and, when
/// the last one fails, reports a fatal error. Only that report is certain.
void handleWhileStarting(QtMsgType type, const QMessageLogContext& context, const QString& text) {
    if (type == QtFatalMsg) {
        std::fprintf(stderr, "QIVO Viewer cannot open a display: %s.\n", displayTried().constData());
        std::fflush(nullptr);
        std::_Exit(MissingDisplayGuard::kExitCode);
    }
    if (context.category == nullptr || std::strncmp(context.category, "qt.qpa.", 7) != 0) {
        usualHandler(type, context, text);
    }
}

} // namespace

MissingDisplayGuard::MissingDisplayGuard() {
    usualHandler = qInstallMessageHandler(handleWhileStarting);
}

MissingDisplayGuard::~MissingDisplayGuard() {
    qInstallMessageHandler(usualHandler);
}

} // namespace qivo
