# The finding half of the runtime: multicast DNS with an embedded stack.
add_library(qivo_runtime_log STATIC Log.cpp Log.h)
target_link_libraries(qivo_runtime_log PUBLIC qivo_options)

add_library(qivo_runtime_finder STATIC
    Announcement.cpp Announcement.h
    Browser.cpp Browser.h
    Directory.cpp Directory.h
    EventLoop.cpp EventLoop.h
    Finder.cpp Finder.h
    LocalNetwork.cpp LocalNetwork.h
    LogOnce.cpp LogOnce.h
    PacketGuard.cpp PacketGuard.h
    SourceTable.cpp SourceTable.h)
target_link_libraries(qivo_runtime_finder PUBLIC qivo_interface
                      PRIVATE qivo_runtime_log PkgConfig::AVAHI Threads::Threads)
