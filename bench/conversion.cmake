# From a decoder's planes to RGBA, and back to an encoder's. Run build/release/bench/bench-conversion.
if(TARGET qivo_runtime AND TARGET qivo_record)
    add_executable(bench-conversion Conversion.cpp)
    target_link_libraries(bench-conversion PRIVATE qivo_runtime qivo_record qivo_options)
    set_target_properties(bench-conversion PROPERTIES RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/bench)
endif()
