# The player's tests and benchmarks find preferences of their own, empty ones.
set(playback_environment HOME=${CMAKE_BINARY_DIR}/tests/audio-home
                         XDG_CONFIG_HOME=${CMAKE_BINARY_DIR}/tests/audio-home/.config)


add_library(qivo_fake_audio_queue STATIC FakeAudioQueue.cpp FakeAudioQueue.h)
target_link_libraries(qivo_fake_audio_queue PUBLIC qivo_options)

qivo_test(test-audio-playback SOURCES AudioPlaybackTest.cpp
          LIBRARIES qivo_audio_player qivo_fake_audio_queue qivo_fake
          ENVIRONMENT ${playback_environment})
if(TARGET test-audio-playback)
    target_link_options(test-audio-playback PRIVATE LINKER:--wrap=realloc) # fails where a test says so
endif()

# The player on this machine's way to a sound server, which the test starts itself. It hears what a person would, so
# nothing else should keep the machine busy.
add_library(qivo_sound_server STATIC SoundServer.cpp SoundServer.h)
target_link_libraries(qivo_sound_server PUBLIC qivo_test_support)
qivo_test(test-real-sound SOURCES RealSoundTest.cpp SoundAnalysisTest.cpp
          LIBRARIES qivo_audio_player qivo_audio_queue qivo_fake qivo_sound_server PkgConfig::SDL2
          SERIAL TIMEOUT 120 ENVIRONMENT ${playback_environment})

add_library(qivo_steady_source STATIC SteadySource.cpp SteadySource.h)
target_link_libraries(qivo_steady_source PUBLIC qivo_interface)
add_library(qivo_allocation_count OBJECT AllocationCount.cpp AllocationCount.h)
target_link_libraries(qivo_allocation_count PUBLIC qivo_options)
qivo_test(test-audio-allocations SOURCES AllocationTest.cpp WaitCount.cpp WaitCount.h
          LIBRARIES qivo_audio_player qivo_null_audio qivo_steady_source qivo_allocation_count qivo_sound_server
          ENVIRONMENT ${playback_environment})

# The whole way of the sound in simulated time.
add_library(qivo_live_source STATIC LiveSource.cpp LiveSource.h)
target_link_libraries(qivo_live_source PUBLIC qivo_interface PRIVATE qivo_runtime_sound)
qivo_test(test-playback-queue SOURCES PlaybackQueueTest.cpp
          LIBRARIES qivo_audio_player qivo_null_audio qivo_live_source BUSY
          ENVIRONMENT ${playback_environment})
qivo_test(test-sdl-playback SOURCES SdlPlaybackTest.cpp
          LIBRARIES qivo_audio_player qivo_audio_queue qivo_live_source TSAN
          ENVIRONMENT ${playback_environment})
