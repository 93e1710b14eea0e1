#pragma once

#include <string>

namespace qivo {

/// Where the library that answers the QIVOlib_ operations came from, for messages.
///
/// The viewer defines every operation of `qivo.h` itself and forwards it to a shared library that is opened by the
/// first `QIVOlib_initialize`: an installed `libqivo.so` if the dynamic linker finds one, else the one that ships
/// beside the program. An installed library that lacks an operation, or that is found but cannot be loaded (damaged, or
/// without one that it needs), is refused rather than passed over, since falling back silently would hide a broken
/// installation. Until a library is open every operation answers false, null or nothing.
///
/// Thread: any. The library stays mapped until the process ends, because the runtimes underneath it do not unload.
std::string loadedLibraryPath();

/// Why the last `QIVOlib_initialize` failed: no library could be opened, or it refused to start. Empty if it succeeded
/// or none was made.
std::string loadError();

} // namespace qivo
