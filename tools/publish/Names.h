#pragma once

#include <string>
#include <string_view>

// The rules for what sources are called and where they are found.
namespace qivo {

/** The longest name that DNS-SD can announce, in bytes of UTF-8. */
inline constexpr std::size_t maximumInstanceNameBytes = 63;

/** True for well-formed UTF-8: no overlong forms, no surrogates, nothing above U+10FFFF. */
[[nodiscard]] bool isUtf8(std::string_view text);

/** True if the UTF-8 text holds a control character (C0, DEL or C1). */
[[nodiscard]] bool hasControlCharacter(std::string_view text);

/** "MACHINE (SOURCE)". */
[[nodiscard]] std::string instanceName(std::string_view machine, std::string_view source);

/** What stands in the way of announcing `machine`: one line that names it and says what to do; empty if nothing. */
[[nodiscard]] std::string machineNameProblem(std::string_view machine);

/** The same for a source on that machine. */
[[nodiscard]] std::string sourceNameProblem(std::string_view machine, std::string_view source);

/** The name to announce when `attempt` - 1 others were taken: "MACHINE (SOURCE #2)" for 2. The source's name, and at
 *  last the machine's, is cut between characters where the number would not fit. */
[[nodiscard]] std::string alternativeInstanceName(std::string_view machine, std::string_view source, int attempt);

/** The longest start of the UTF-8 text that has at most `bytes` bytes and ends between characters. */
[[nodiscard]] std::string_view cutUtf8(std::string_view text, std::size_t bytes);

} // namespace qivo
