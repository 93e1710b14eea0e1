#include "sdk/Loader.h"
#include "sdk/qivo.h"
#include "tools/record/Arguments.h"
#include "tools/record/Recorder.h"
#include "tools/record/Surroundings.h"

#include <cstdio>

namespace {

using namespace qivo::record;

constexpr Nanoseconds progressInterval = std::chrono::milliseconds(100);

int fail(const std::string& text) {
    std::fprintf(stderr, "%s: %s\n", programName, text.c_str());
    return 1;
}

/// Until somebody wants it to end, or it cannot go on.
void watch(Surroundings& surroundings, const Recorder& recorder) {
    do {
        surroundings.tell(progressLine(recorder.progress(steadyNow())));
    } while (!surroundings.endWanted(progressInterval) && recorder.state(steadyNow()) == Recorder::State::running);
}

int record(const Arguments& arguments, const MoviePlace& place, Surroundings& surroundings) {
    Recorder recorder({arguments.source}, place);
    watch(surroundings, recorder);
    const bool gone = recorder.state(steadyNow()) == Recorder::State::sourceGone;
    recorder.finish();
    const Progress result = recorder.progress(steadyNow());
    surroundings.tell(progressLine(result));
    if (!recorder.problem().empty()) {
        return fail(recorder.problem());
    }
    if (result.bytes == 0) {
        return fail("nothing came from \"" + arguments.source + "\": there is no movie");
    }
    if (gone) {
        std::fprintf(stderr, "%s: \"%s\" has gone: the movie is finished\n", programName, arguments.source.c_str());
    }
    return 0;
}

/// Prepares all that recording needs, once the place for the movie is found good.
int prepareAndRecord(const Arguments& arguments, Surroundings& surroundings) {
    const MoviePlace place(arguments.source, arguments.output);
    const std::string problem = place.problem();
    if (!problem.empty()) {
        return fail(problem);
    }
    gst_init(nullptr, nullptr);
    if (!QIVOlib_initialize()) {
        const std::string error = qivo::loadError();
        return fail(error.empty() ? "libqivo cannot run on this machine" : error);
    }
    const int code = record(arguments, place, surroundings);
    QIVOlib_destroy();
    return code;
}

} // namespace

int main(int argc, char** argv) {
    const auto parsed = parseArguments({argv + 1, argv + argc});
    if (const auto* error = std::get_if<UsageError>(&parsed)) {
        std::fputs(error->text.c_str(), stderr);
        return usageExitCode;
    }
    Surroundings surroundings;
    return prepareAndRecord(std::get<Arguments>(parsed), surroundings);
}
