# Needs the allocation counter and the source of the tests.
if(BUILD_TESTING AND NOT QIVO_SANITIZE)
    add_executable(bench-playback ${CMAKE_CURRENT_LIST_DIR}/playback.cpp)
    target_link_libraries(bench-playback PRIVATE qivo_audio_player qivo_steady_source qivo_allocation_count qivo_options)
    set_target_properties(bench-playback PROPERTIES RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/bench)
endif()
