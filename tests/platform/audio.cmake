qivo_test(test-spsc-queue SOURCES SpscQueueTest.cpp LIBRARIES qivo_audio_queue TSAN BUSY)
qivo_test(test-audio-drain SOURCES AudioDrainTest.cpp LIBRARIES qivo_audio_queue TSAN BUSY)
qivo_test(test-fallback-audio SOURCES FallbackAudioTest.cpp LIBRARIES qivo_null_audio TSAN)
qivo_test(test-audio-queue SOURCES AudioQueueTest.cpp LIBRARIES qivo_null_audio TSAN)
