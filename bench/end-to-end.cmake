# The viewer beside other programs on the same live source and the same virtual screen. Run it with bench/end-to-end.
if(TARGET qivo-viewer AND TARGET qivo-publish AND TARGET qivo AND TARGET qivo_test_support AND
   TARGET qivo_movie_reader)
    add_executable(bench-end-to-end EndToEnd.cpp)
    target_link_libraries(bench-end-to-end PRIVATE qivo_movie_reader qivo_test_support qivo_time_code)
    target_compile_definitions(bench-end-to-end PRIVATE VIEWER="$<TARGET_FILE:qivo-viewer>"
                               PUBLISH="$<TARGET_FILE:qivo-publish>")
    set_target_properties(bench-end-to-end PROPERTIES RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/bench)
    add_dependencies(bench-end-to-end qivo-viewer qivo-publish qivo)
endif()
