# The audio queue. It drains into the output driver that is chosen in the process; the one for this machine's devices
# comes along, the one without a device is a library of its own.
pkg_check_modules(PULSE REQUIRED IMPORTED_TARGET libpulse)
pkg_check_modules(SDL2 REQUIRED IMPORTED_TARGET GLOBAL sdl2)
add_library(qivo_audio_queue STATIC
            AudioDrain.cpp AudioDrain.h AudioKeeper.cpp AudioKeeper.h AudioOutput.cpp AudioOutput.h
            AudioQueue.cpp AudioQueue.h FallbackAudioOutput.cpp FallbackAudioOutput.h
            PulseAudioOutput.cpp PulseAudioOutput.h SdlAudioOutput.cpp SdlAudioOutput.h SpscQueue.h)
target_link_libraries(qivo_audio_queue PUBLIC qivo_options Qt6::Core Threads::Threads
                      PRIVATE qivo_platform_base PkgConfig::PULSE PkgConfig::SDL2)

add_library(qivo_null_audio STATIC NullAudioOutput.cpp NullAudioOutput.h)
target_link_libraries(qivo_null_audio PUBLIC qivo_audio_queue)
