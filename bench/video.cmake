# The capture pass against a copy of the frame; needs no display. Run build/release/bench/bench-capture.
if(TARGET qivo_gl_testing)
    add_executable(bench-capture Capture.cpp)
    target_link_libraries(bench-capture PRIVATE qivo_video qivo_gl_testing PkgConfig::EPOXY)
    set_target_properties(bench-capture PROPERTIES RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/bench)
endif()
