add_library(qivo_finder_responder STATIC FinderResponder.cpp FinderResponder.h)
target_link_libraries(qivo_finder_responder PUBLIC qivo_options Threads::Threads)

add_executable(finder-watch finder-watch.cpp)
target_link_libraries(finder-watch PRIVATE qivo_runtime_finder)
set_target_properties(finder-watch PROPERTIES RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/tests)

qivo_test(test-announcement SOURCES AnnouncementTest.cpp LIBRARIES qivo_runtime_finder)
qivo_test(test-source-table SOURCES SourceTableTest.cpp LIBRARIES qivo_runtime_finder)
qivo_test(test-log-once SOURCES LogOnceTest.cpp LIBRARIES qivo_runtime_finder)
qivo_test(test-directory SOURCES DirectoryTest.cpp LIBRARIES qivo_runtime_finder qivo_finder_responder
          NETWORK TSAN TIMEOUT 120)
qivo_test(test-finder SOURCES FinderTest.cpp LIBRARIES qivo_runtime_finder qivo_finder_responder qivo_allocation_count
          NETWORK TSAN TIMEOUT 120)
qivo_test(test-finder-interfaces SOURCES FinderInterfacesTest.cpp LIBRARIES qivo_runtime_finder qivo_finder_responder
          NETWORK TSAN TIMEOUT 120)
if(TARGET test-directory)
    target_compile_definitions(test-directory PRIVATE FINDER_WATCH="$<TARGET_FILE:finder-watch>")
    add_dependencies(test-directory finder-watch)
endif()
# Needs the packages avahi-daemon, avahi-utils and dbus-daemon.
if(QIVO_PEER_TESTS)
    qivo_test(test-finder-peers SOURCES FinderPeersTest.cpp
              LIBRARIES qivo_runtime_finder qivo_finder_responder qivo_test_support NETWORK TIMEOUT 120)
endif()
