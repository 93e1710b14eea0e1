#include "tools/record/Arguments.h"

#include <algorithm>
#include <array>
#include <optional>

namespace qivo::record {
namespace {

UsageError wrong(const std::string& what) {
    const std::string name = programName;
    return {name + ": " + what + "\nusage: " + name + " -i SOURCE -o FILE.mov -orvane -nothumbnail\n"};
}

/** A flag, and its value where it has one. */
struct Flag {
    std::string name;
    bool takesValue = false;
    std::optional<std::string> value;
};

} // namespace

std::variant<Arguments, UsageError> parseArguments(const std::vector<std::string>& arguments) {
    std::array<Flag, 4> flags = {
        {{"-i", true, {}}, {"-o", true, {}}, {"-orvane", false, {}}, {"-nothumbnail", false, {}}}};
    for (auto argument = arguments.begin(); argument != arguments.end(); ++argument) {
        const auto flag =
            std::find_if(flags.begin(), flags.end(), [&](const Flag& known) { return known.name == *argument; });
        if (flag == flags.end()) {
            return wrong("unknown argument \"" + *argument + "\"");
        }
        if (flag->value) {
            return wrong(flag->name + " is given twice");
        }
        if (flag->takesValue && ++argument == arguments.end()) {
            return wrong(flag->name + " needs a value");
        }
        flag->value = flag->takesValue ? *argument : std::string("given");
        if (flag->value->empty()) {
            return wrong(flag->name + " is empty");
        }
    }
    for (const Flag& flag : flags) {
        if (!flag.value) {
            return wrong(flag.name + " is missing");
        }
    }
    return Arguments{*flags[0].value, *flags[1].value};
}

} // namespace qivo::record
