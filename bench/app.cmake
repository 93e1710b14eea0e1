find_package(benchmark REQUIRED)
add_executable(bench-app ${CMAKE_CURRENT_LIST_DIR}/app.cpp)
target_link_libraries(bench-app PRIVATE qivo_model qivo_discovery qivo_fake benchmark::benchmark)
set_target_properties(bench-app PROPERTIES RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/bench)
