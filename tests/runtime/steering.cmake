add_library(qivo_scripted_camera STATIC RawServer.cpp RawServer.h ScriptedCamera.cpp ScriptedCamera.h
                                        SteeringFixture.cpp SteeringFixture.h Patience.h)
target_link_libraries(qivo_scripted_camera PUBLIC qivo_runtime_steering GTest::gtest)

qivo_test(test-steering-parts SOURCES SteeringPartsTest.cpp SteeringQueueTest.cpp LIBRARIES qivo_runtime_steering TSAN)
qivo_test(test-steering SOURCES SteeringTest.cpp LIBRARIES qivo_scripted_camera NETWORK TSAN SERIAL)
