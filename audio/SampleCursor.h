#pragma once

namespace qivo {

/// A region of float samples that a call reads or writes from the front. The caller owns the memory; a call that takes
/// the cursor by address moves `position` and leaves `end`, so the caller sees how far it got.
struct SampleCursor {
    float* position; ///< the next float to read or write
    float* end;      ///< one past the last float of the region
};

} // namespace qivo
