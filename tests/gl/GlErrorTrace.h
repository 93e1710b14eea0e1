#pragma once

#include <string>
#include <vector>

namespace qivo {

/// Asks GL for errors after each of the GL calls that the kit makes, for as long as it lives: GL itself keeps only the
/// first of a kind and does not say whose it was. Needs a context; errors that are pending when it is made are dropped.
/// One at a time.
class GlErrorTrace {
  public:
    GlErrorTrace();
    ~GlErrorTrace();
    GlErrorTrace(const GlErrorTrace&) = delete;
    GlErrorTrace& operator=(const GlErrorTrace&) = delete;

    /// The calls that failed since the last time, in order: "glEnable: GL_INVALID_ENUM".
    std::vector<std::string> take();
};

} // namespace qivo
