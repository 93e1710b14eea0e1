#include "tests/gl/GlErrorTrace.h"

#include "tests/gl/EglContext.h"

#include <epoxy/gl.h>

#include <type_traits>
#include <utility>

namespace qivo {

namespace {

std::vector<std::string> failures;

void noteErrors(const char* function) {
    for (const auto& error : takeGlErrors()) {
        failures.push_back(std::string(function) + ": " + error);
    }
}

/// Takes the place of the function in a dispatch slot.
template <auto Slot>
struct Traced;

template <typename Result, typename... Arguments, Result (**Slot)(Arguments...)>
struct Traced<Slot> {
    static inline Result (*original)(Arguments...) = nullptr;
    static inline const char* function = nullptr;

    static void install(const char* name) {
        function = name;
        original = std::exchange(*Slot, &call);
    }

    static void restore() { *Slot = original; }

    static Result call(Arguments... arguments) {
        // A slot's first function looks the driver's up and puts it in its own place, so it has to be there.
        *Slot = original;
        if constexpr (std::is_void_v<Result>) {
            original(arguments...);
            afterwards();
        } else {
            const Result result = original(arguments...);
            afterwards();
            return result;
        }
    }

    static void afterwards() {
        install(function);
        noteErrors(function);
    }
};

template <auto... Slots>
struct Functions {
    template <typename... Names>
    static void install(Names... names) {
        (Traced<Slots>::install(names), ...);
    }
    static void restore() { (Traced<Slots>::restore(), ...); }
};

#define SLOTS(apply)                                                                                                   \
    apply(AttachShader), apply(BindAttribLocation), apply(BindBuffer), apply(BindTexture), apply(BindVertexArray),     \
        apply(BufferData), apply(CompileShader), apply(CreateProgram), apply(CreateShader), apply(DeleteBuffers),      \
        apply(DeleteProgram), apply(DeleteShader), apply(DeleteTextures), apply(DeleteVertexArrays), apply(Disable),   \
        apply(DisableVertexAttribArray), apply(DrawArrays), apply(Enable), apply(EnableVertexAttribArray),             \
        apply(GenBuffers), apply(GenTextures), apply(GenVertexArrays), apply(GetProgramInfoLog), apply(GetProgramiv),  \
        apply(GetShaderInfoLog), apply(GetShaderiv), apply(LinkProgram), apply(PixelStorei), apply(ShaderSource),      \
        apply(TexImage2D), apply(TexParameteri), apply(TexSubImage2D), apply(UseProgram), apply(VertexAttribPointer)
#define SLOT(name) &epoxy_gl##name
#define NAME(name) "gl" #name

using AllFunctions = Functions<SLOTS(SLOT)>;

} // namespace

GlErrorTrace::GlErrorTrace() {
    takeGlErrors();
    failures.clear();
    AllFunctions::install(SLOTS(NAME));
}

GlErrorTrace::~GlErrorTrace() {
    AllFunctions::restore();
}

std::vector<std::string> GlErrorTrace::take() {
    return std::exchange(failures, {});
}

} // namespace qivo
