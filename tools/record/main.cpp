#include "sdk/Loader.h"
#include "sdk/qivo.h"
#include "tools/record/Arguments.h"
#include "tools/record/Recorder.h"
#include "tools/record/Surroundings.h"

#include <cstdio>
#include <cstdlib>
#include <functional>
#include <future>

namespace {

using namespace qivo::record;

constexpr Nanoseconds progressInterval = std::chrono::milliseconds(100);

int fail(const std::string& text) {
    std::fprintf(stderr, "%s: %s\n", programName, text.c_str());
    return 1;
}

/// Whoever started the program waits for its next line, also while it does something that takes long.
template <typename Work, typename Tell>
void doWhileTelling(Work work, Tell tell) {
    const std::future<void> done = std::async(std::launch::async, work);
    do {
        tell();
    } while (done.wait_for(progressInterval) != std::future_status::ready);
}

/// Until somebody wants it to end, or it cannot go on.
template <typename TellEncoder>
void watch(Surroundings& surroundings, const Recorder& recorder, TellEncoder tellEncoder) {
    do {
        surroundings.tell(progressLine(recorder.progress(steadyNow())));
        tellEncoder();
    } while (!surroundings.endWanted(progressInterval) && recorder.state(steadyNow()) == Recorder::State::running);
}

int fail(const Arguments& arguments) {
    return fail("nothing came from \"" + arguments.source + "\": there is no movie");
}

int watchAndFinish(const Arguments& arguments, Recorder& recorder, Surroundings& surroundings) {
    auto tellEncoder = [&recorder, told = false]() mutable {
        const std::string encoder = told ? "" : recorder.encoder();
        if (!encoder.empty()) {
            std::fprintf(stderr, "%s: %s\n", programName, encoder.c_str());
            told = true;
        }
    };
    watch(surroundings, recorder, std::ref(tellEncoder));
    const bool gone = recorder.state(steadyNow()) == Recorder::State::sourceGone;
    const auto tell = [&] { surroundings.tell(progressLine(recorder.progress(steadyNow()))); };
    doWhileTelling([&] { recorder.finish(); }, tell);
    tell();
    tellEncoder(); // it may have been chosen only now
    if (!recorder.problem().empty()) {
        return fail(recorder.problem());
    }
    if (recorder.progress(steadyNow()).bytes == 0) {
        return fail(arguments);
    }
    if (gone) {
        std::fprintf(stderr, "%s: \"%s\" has gone: the movie is finished\n", programName, arguments.source.c_str());
    }
    if (!recorder.remark().empty()) {
        std::fprintf(stderr, "%s: %s\n", programName, recorder.remark().c_str());
    }
    return 0;
}

int record(const Arguments& arguments, const MoviePlace& place, Surroundings& surroundings) {
    Recorder recorder({arguments.source}, place);
    const int code = watchAndFinish(arguments, recorder, surroundings);
    if (recorder.isTrying()) {
        std::_Exit(code); // what has been said is out, as nothing here is buffered
    }
    return code;
}

/// Prepares all that recording needs, once the place for the movie is found good.
int prepareAndRecord(const Arguments& arguments, Surroundings& surroundings) {
    const MoviePlace place(arguments.source, arguments.output);
    const std::string problem = place.problem();
    if (!problem.empty()) {
        return fail(problem);
    }
    Progress nothing;
    nothing.waiting = "the source";
    bool initialised = false;
    doWhileTelling(
        [&] {
            gst_init(nullptr, nullptr);
            initialised = QIVOlib_initialize();
        },
        [&] {
            surroundings.tell(progressLine(nothing));
            // Looking through plug-ins for the first time takes GStreamer seconds and cannot be called off.
            if (surroundings.endWanted(Nanoseconds(0))) {
                std::_Exit(fail(arguments));
            }
        });
    if (!initialised) {
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
