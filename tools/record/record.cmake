# What becomes of coded pictures and sound: the time line and the file. It needs no GStreamer.
add_library(qivo_movie STATIC
    record/Fragmenter.cpp
    record/MovieAtoms.cpp
    record/MovieFile.cpp
    record/MoviePlace.cpp
    record/MovieWriter.cpp
    record/SampleDescription.cpp
    record/SampleTables.cpp
    record/SoundPlacer.cpp
    record/TrackAtoms.cpp)
target_link_libraries(qivo_movie PUBLIC Threads::Threads PRIVATE qivo_options)

# The recorder. Everything but its main function, so that tests reach the classes; whoever links it brings a libqivo.
add_library(qivo_record STATIC
    record/Arguments.cpp
    record/EncoderChoice.cpp
    record/PictureEncoder.cpp
    record/PictureFitter.cpp
    record/PictureShape.cpp
    record/PlanarRows.cpp
    record/Progress.cpp
    record/Reception.cpp
    record/Recorder.cpp
    record/SoundFitter.cpp
    record/SourceClock.cpp
    record/Surroundings.cpp)
target_link_libraries(qivo_record PUBLIC qivo_movie qivo_interface PkgConfig::GSTREAMER PRIVATE qivo_options)

# Live pictures go through it: while one is converted, unoptimised, others come and are lost.
set_source_files_properties(record/PlanarRows.cpp PROPERTIES COMPILE_OPTIONS -O2)

add_executable(qivo-record record/main.cpp)
set_target_properties(qivo-record PROPERTIES OUTPUT_NAME Application.Mac.QIVO.Recording)
target_link_libraries(qivo-record PRIVATE qivo_record qivo_loader qivo_options)
# Where ./run has put a link to the built program, installing would find that it leads to the same and leave it.
install(CODE "
    set(place \"\$ENV{DESTDIR}\${CMAKE_INSTALL_PREFIX}/${CMAKE_INSTALL_BINDIR}/Application.Mac.QIVO.Recording\")
    if(IS_SYMLINK \"\${place}\")
        file(REMOVE \"\${place}\")
    endif()")
install(TARGETS qivo-record RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
