add_library(qivo_scripted_camera STATIC RawServer.cpp RawServer.h ScriptedCamera.cpp ScriptedCamera.h
                                        SteeringFixture.cpp SteeringFixture.h Patience.h)
target_link_libraries(qivo_scripted_camera PUBLIC qivo_runtime_steering qivo_stopwatch GTest::gtest
                                           PRIVATE PkgConfig::GSTREAMER)

qivo_test(test-steering-parts SOURCES SteeringPartsTest.cpp SteeringQueueTest.cpp LIBRARIES qivo_runtime_steering TSAN)
qivo_test(test-steering SOURCES SteeringTest.cpp SteeringQuirksTest.cpp LIBRARIES qivo_scripted_camera
          PkgConfig::GSTREAMER NETWORK TSAN SERIAL SHARES 1)

# Through receivers and, in a process of its own, through the library as it is installed.
if(NOT QIVO_SANITIZE STREQUAL "thread")
    add_executable(steer-child steer-child.cpp)
    target_link_libraries(steer-child PRIVATE qivo qivo_options)
    set_target_properties(steer-child PROPERTIES RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/tests)
    qivo_test(test-steering-receivers SOURCES SteeringReceiverTest.cpp
              LIBRARIES qivo_receiver_fixture qivo_scripted_camera qivo_test_support NETWORK SERIAL
              ENVIRONMENT ${unwind})
    target_compile_definitions(test-steering-receivers PRIVATE STEER_CHILD="$<TARGET_FILE:steer-child>")
    add_dependencies(test-steering-receivers steer-child)
endif()
