# Surfaces against plain copies. Run build/release/bench/bench-surface.
add_executable(bench-surface Surface.cpp)
target_link_libraries(bench-surface PRIVATE qivo_surface)
set_target_properties(bench-surface PROPERTIES RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/bench)
