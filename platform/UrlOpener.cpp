#include "platform/UrlOpener.h"

#include "platform/Log.h"

#include <QDesktopServices>

#include <utility>

namespace qivo {
namespace {

UrlOpener& replacement() {
    static UrlOpener opener;
    return opener;
}

} // namespace

bool openUrl(const QUrl& url) {
    const bool opened = replacement() ? replacement()(url) : QDesktopServices::openUrl(url);
    if (!opened) {
        logLine("%s could not be opened in a browser", qUtf8Printable(url.toString()));
    }
    return opened;
}

void setUrlOpener(UrlOpener opener) {
    replacement() = std::move(opener);
}

} // namespace qivo
