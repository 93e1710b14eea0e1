#pragma once

namespace qivo {

// The files of the control page, as they stand beside this.
extern const char* const pageHtml;
extern const char* const pageCss;
extern const char* const pageJs;

} // namespace qivo
