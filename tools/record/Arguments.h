#pragma once

#include <string>
#include <variant>
#include <vector>

namespace qivo::record {

inline constexpr const char* programName = "Application.Mac.QIVO.Recording";

/** What the command line asks for. */
struct Arguments {
    std::string source; ///< the announced name as it stands
    std::string output; ///< path of the movie, not empty
};

/** The usage, and what is wrong in a line of its own before it; the program ends with usageExitCode. */
struct UsageError {
    std::string text;
};

inline constexpr int usageExitCode = 2;

/** Reads the arguments that follow the program's name: all six, in any order, each flag once. What follows -i and -o is
 *  taken as it stands, also if it looks like a flag. */
[[nodiscard]] std::variant<Arguments, UsageError> parseArguments(const std::vector<std::string>& arguments);

} // namespace qivo::record
