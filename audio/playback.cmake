# The player without an audio queue, for tests that bring one of their own, and with the real one.
add_library(qivo_audio_player STATIC AudioPlayback.cpp AudioPlayback.h)
target_link_libraries(qivo_audio_player PUBLIC qivo_model qivo_resampler qivo_interface Qt6::Core)
add_library(qivo_audio INTERFACE)
target_link_libraries(qivo_audio INTERFACE qivo_audio_player qivo_audio_queue)
