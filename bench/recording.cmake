# The recorder beside publisher and viewer on the same machine. Run it with bench/recording.
if(TARGET qivo-viewer AND TARGET qivo-publish AND TARGET qivo-record AND TARGET qivo AND TARGET qivo_movie_reader)
    add_executable(bench-recording Recording.cpp)
    target_link_libraries(bench-recording PRIVATE qivo_movie qivo_movie_reader qivo_test_support)
    target_compile_definitions(bench-recording PRIVATE VIEWER="$<TARGET_FILE:qivo-viewer>"
                               PUBLISH="$<TARGET_FILE:qivo-publish>" RECORDER="$<TARGET_FILE:qivo-record>")
    set_target_properties(bench-recording PROPERTIES RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/bench)
    add_dependencies(bench-recording qivo-viewer qivo-publish qivo-record qivo)
endif()
