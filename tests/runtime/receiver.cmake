add_library(qivo_stopwatch STATIC Stopwatch.cpp Stopwatch.h)
target_link_libraries(qivo_stopwatch PRIVATE qivo_options)

add_library(qivo_receiver_fixture STATIC CountingAllocator.cpp CountingAllocator.h
                                         ReceiverFixture.cpp ReceiverFixture.h RtspServer.cpp RtspServer.h
                                         RawServer.cpp RawServer.h RtpPackets.h)
target_link_libraries(qivo_receiver_fixture PUBLIC qivo_runtime qivo_stopwatch PkgConfig::GSTRTSPSERVER
                                                   GTest::gtest)

qivo_test(receiver-streams SOURCES ReceiverStreamTest.cpp LIBRARIES qivo_receiver_fixture NETWORK BUSY
          SHARES 2 ENVIRONMENT ${unwind})
qivo_test(receiver-hostile SOURCES ReceiverHostileTest.cpp LIBRARIES qivo_receiver_fixture NETWORK
          SHARES 4 ENVIRONMENT ${unwind})
qivo_test(receiver-healing SOURCES ReceiverHealingTest.cpp LIBRARIES qivo_receiver_fixture NETWORK BUSY
          SHARES 2 ENVIRONMENT ${unwind})
qivo_test(sound-parts SOURCES ChannelOrderTest.cpp SoundQueueTest.cpp LIBRARIES qivo_runtime TSAN)
qivo_test(receiver-sound SOURCES ReceiverSoundTest.cpp LIBRARIES qivo_receiver_fixture qivo_test_tone NETWORK BUSY
          SHARES 3 ENVIRONMENT ${unwind} TIMEOUT 120)
qivo_test(picture-converter SOURCES PictureConverterTest.cpp LIBRARIES qivo_runtime ENVIRONMENT ${unwind})
qivo_test(receiver-parts SOURCES CallerPaceTest.cpp MailboxTest.cpp ReceiverPartsTest.cpp LIBRARIES qivo_runtime TSAN)

# Through the library itself, which brings its own copy of everything that it is made of.
if(NOT QIVO_SANITIZE STREQUAL "thread")
    qivo_test(receiver-handles SOURCES ReceiverHandleTest.cpp RtspServer.cpp LIBRARIES qivo PkgConfig::GSTRTSPSERVER
              PkgConfig::GSTREAMER NETWORK ENVIRONMENT ${unwind})
    target_compile_definitions(receiver-handles PRIVATE QIVO_LIBRARY="$<TARGET_FILE:qivo>")
endif()
