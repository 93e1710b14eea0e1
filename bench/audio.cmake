# The libraries that the resampler is measured against; without one of them there is nothing to compare.
pkg_check_modules(RESAMPLER_PEERS IMPORTED_TARGET soxr speexdsp samplerate)
if(RESAMPLER_PEERS_FOUND)
    add_executable(bench-resampler ${CMAKE_CURRENT_LIST_DIR}/resampler.cpp)
    target_link_libraries(bench-resampler PRIVATE qivo_resampler qivo_options PkgConfig::RESAMPLER_PEERS)
    set_target_properties(bench-resampler PROPERTIES RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/bench)
endif()
