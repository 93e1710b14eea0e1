#pragma once

namespace qivo {

/** A GStreamer element, and the Debian package that brings it. */
struct NeededElement {
    const char* name;
    const char* package;
};

} // namespace qivo
