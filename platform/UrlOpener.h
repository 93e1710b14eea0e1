#pragma once

#include <QUrl>

#include <functional>

namespace qivo {

using UrlOpener = std::function<bool(const QUrl&)>;

/// Opens an address in the user's browser. False if the system knows no program for it; a line in the log says so.
///
/// Thread: main.
bool openUrl(const QUrl& url);

/// Replaces what opens addresses; an empty function puts the system's way back.
void setUrlOpener(UrlOpener opener);

} // namespace qivo
