#pragma once

#include <string>

namespace qivo {

/// The directory that holds the application's resources: "../share/qivo-viewer" seen from the program's own directory,
/// both in a build tree and where it is installed. It need not exist.
///
/// Thread: any.
std::string resourcePath();

/// Makes another directory the resource directory, or the program's own again if `path` is empty.
///
/// Thread: any.
void setResourcePath(std::string path);

} // namespace qivo
